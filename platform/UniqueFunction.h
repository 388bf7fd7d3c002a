// SPDX-License-Identifier: Apache-2.0
// UniqueFunction: a move-only callable with room for small ones inside itself.
//
// Replies, queue work and handlers are made and used once each, many thousands of times a second; std::function would
// ask that they be copyable and would allocate for nearly all of them.
#pragma once

#include <cstddef>
#include <functional>
#include <new>
#include <type_traits>
#include <utility>

namespace tarn::platform {

template <class Signature, std::size_t kInlineBytes = 48>
class UniqueFunction;

// A callable of any type with this signature, or none. Owned by whoever holds it, called by one thread at a time; the
// callable is destroyed with it. One that is no larger than `kInlineBytes`, isn't over-aligned and moves without
// throwing lies inside; any other is allocated once and then moves as a pointer.
//
// How: `verbs_` points at a constant table of the three things that are done with a callable, one table for each type,
// so that callables need no common base and an empty object is a null pointer.
template <class Result, class... Args, std::size_t kInlineBytes>
class UniqueFunction<Result(Args...), kInlineBytes> {
 public:
  // Holds nothing.
  UniqueFunction() noexcept = default;
  // No callable, so that "none" can be handed over.
  UniqueFunction(std::nullptr_t) noexcept {}  // NOLINT(google-explicit-constructor): no callable
  // Takes over the callable, by a copy or a move as it is given. Throws what that throws, and std::bad_alloc for one
  // that doesn't fit inside.
  template <class Callable>
  requires(!std::same_as<std::remove_cvref_t<Callable>, UniqueFunction> &&
           std::is_invocable_r_v<Result, std::remove_cvref_t<Callable>&, Args...>)
      UniqueFunction(Callable&& callable) {  // NOLINT(google-explicit-constructor): any callable will do
    using Stored = std::remove_cvref_t<Callable>;
    if constexpr (fitsInline<Stored>()) {
      ::new (static_cast<void*>(storage_)) Stored(std::forward<Callable>(callable));
      verbs_ = &kInlineVerbs<Stored>;
    } else {
      ::new (static_cast<void*>(storage_)) Stored*(new Stored(std::forward<Callable>(callable)));
      verbs_ = &kHeapVerbs<Stored>;
    }
  }
  // The other one is empty afterwards. Never throws, whatever the callable is.
  UniqueFunction(UniqueFunction&& other) noexcept { takeFrom(other); }
  // What was held is destroyed first; assigning to itself does nothing.
  UniqueFunction& operator=(UniqueFunction&& other) noexcept {
    if (this != &other) {
      reset();
      takeFrom(other);
    }
    return *this;
  }
  // A reply or a piece of work that could be copied might be answered or done twice.
  UniqueFunction(const UniqueFunction&) = delete;
  UniqueFunction& operator=(const UniqueFunction&) = delete;
  ~UniqueFunction() { reset(); }

  // Whether there is a callable.
  explicit operator bool() const noexcept { return verbs_ != nullptr; }
  // Calls it; it must hold a callable. It may be called as often as its holder likes, though most are called once. A
  // callable may destroy or replace this very object only as the last thing it does.
  Result operator()(Args... args) { return verbs_->call(storage_, std::forward<Args>(args)...); }
  // Destroys the callable; what its end does finds this object empty already.
  void reset() noexcept {
    if (verbs_ != nullptr) {
      std::exchange(verbs_, nullptr)->destroy(storage_);
    }
  }

 private:
  // What can be done with a callable that lies at some place.
  struct Verbs {
    // Arguments are passed on as they came.
    Result (*call)(void*, Args&&...);
    // Makes it anew at another place and ends it at the first one.
    void (*move)(void* from, void* to) noexcept;
    // Ends it, wherever it lies.
    void (*destroy)(void*) noexcept;
  };
  // Whether the callable lies inside. A move must not throw, since ours doesn't.
  template <class Stored>
  static constexpr bool fitsInline() {
    return sizeof(Stored) <= kInlineBytes && alignof(Stored) <= alignof(std::max_align_t) &&
           std::is_nothrow_move_constructible_v<Stored>;
  }
  // Of callables that lie inside: the place is the callable.
  template <class Stored>
  static constexpr Verbs kInlineVerbs{[](void* at, Args&&... args) -> Result {
                                        return std::invoke(*static_cast<Stored*>(at), std::forward<Args>(args)...);
                                      },
                                      [](void* from, void* to) noexcept {
                                        ::new (to) Stored(std::move(*static_cast<Stored*>(from)));
                                        static_cast<Stored*>(from)->~Stored();
                                      },
                                      [](void* at) noexcept { static_cast<Stored*>(at)->~Stored(); }};
  // Of callables that don't: the place holds a pointer to it.
  template <class Stored>
  static constexpr Verbs kHeapVerbs{
      [](void* at, Args&&... args) -> Result {
        return std::invoke(**static_cast<Stored**>(at), std::forward<Args>(args)...);
      },
      [](void* from, void* to) noexcept { ::new (to) Stored*(*static_cast<Stored**>(from)); },
      [](void* at) noexcept { delete *static_cast<Stored**>(at); }};

  // Moves the other one's callable here, where there is none.
  void takeFrom(UniqueFunction& other) noexcept {
    verbs_ = std::exchange(other.verbs_, nullptr);
    if (verbs_ != nullptr) {
      verbs_->move(other.storage_, storage_);
    }
  }

  // Null: there is no callable.
  const Verbs* verbs_ = nullptr;
  // Uninitialised while there is none. 48 bytes hold six pointers or numbers, which is what most handlers capture.
  alignas(std::max_align_t) std::byte storage_[kInlineBytes];
};

}  // namespace tarn::platform
