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

template <class Result, class... Args, std::size_t kInlineBytes>
class UniqueFunction<Result(Args...), kInlineBytes> {
 public:
  UniqueFunction() noexcept = default;
  UniqueFunction(std::nullptr_t) noexcept {}  // NOLINT(google-explicit-constructor): no callable
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
  UniqueFunction(UniqueFunction&& other) noexcept { takeFrom(other); }
  UniqueFunction& operator=(UniqueFunction&& other) noexcept {
    if (this != &other) {
      reset();
      takeFrom(other);
    }
    return *this;
  }
  UniqueFunction(const UniqueFunction&) = delete;
  UniqueFunction& operator=(const UniqueFunction&) = delete;
  ~UniqueFunction() { reset(); }

  explicit operator bool() const noexcept { return verbs_ != nullptr; }
  // Calls it; it must hold a callable.
  Result operator()(Args... args) { return verbs_->call(storage_, std::forward<Args>(args)...); }
  void reset() noexcept {
    if (verbs_ != nullptr) {
      std::exchange(verbs_, nullptr)->destroy(storage_);
    }
  }

 private:
  struct Verbs {
    Result (*call)(void*, Args&&...);
    void (*move)(void* from, void* to) noexcept;
    void (*destroy)(void*) noexcept;
  };
  template <class Stored>
  static constexpr bool fitsInline() {
    return sizeof(Stored) <= kInlineBytes && alignof(Stored) <= alignof(std::max_align_t) &&
           std::is_nothrow_move_constructible_v<Stored>;
  }
  template <class Stored>
  static constexpr Verbs kInlineVerbs{[](void* at, Args&&... args) -> Result {
                                        return std::invoke(*static_cast<Stored*>(at), std::forward<Args>(args)...);
                                      },
                                      [](void* from, void* to) noexcept {
                                        ::new (to) Stored(std::move(*static_cast<Stored*>(from)));
                                        static_cast<Stored*>(from)->~Stored();
                                      },
                                      [](void* at) noexcept { static_cast<Stored*>(at)->~Stored(); }};
  template <class Stored>
  static constexpr Verbs kHeapVerbs{
      [](void* at, Args&&... args) -> Result {
        return std::invoke(**static_cast<Stored**>(at), std::forward<Args>(args)...);
      },
      [](void* from, void* to) noexcept { ::new (to) Stored*(*static_cast<Stored**>(from)); },
      [](void* at) noexcept { delete *static_cast<Stored**>(at); }};

  void takeFrom(UniqueFunction& other) noexcept {
    verbs_ = std::exchange(other.verbs_, nullptr);
    if (verbs_ != nullptr) {
      verbs_->move(other.storage_, storage_);
    }
  }

  const Verbs* verbs_ = nullptr;
  alignas(std::max_align_t) std::byte storage_[kInlineBytes];
};

}  // namespace tarn::platform
