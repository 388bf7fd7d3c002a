// SPDX-License-Identifier: Apache-2.0
// Locks whose use the compiler checks: what a lock guards says so where it is declared, and touching it without the
// lock is an error (clang's -Wthread-safety, part of ./dev lint). Other compilers read none of the notes.
//
//   mutable Mutex mutex_;
//   std::size_t count_ TARN_GUARDED_BY(mutex_) = 0;
//   void add() TARN_REQUIRES(mutex_);  // called with the lock held
//
// A function that releases its caller's lock for a while calls mutex_.unlock() and mutex_.lock() itself. A class that
// is its own lock says so too: class TARN_CAPABILITY Record { void lock() TARN_ACQUIRE(); void unlock() TARN_RELEASE();
// }.
//
// It lies on the lowest floor, since the tables of keys and of their lists have locks already.
#pragma once

#include <condition_variable>
#include <mutex>
#include <utility>

// The notes are attributes that clang alone knows; g++, which the build uses, would warn of each.
#ifdef __clang__
#define TARN_THREAD_NOTE(note) __attribute__((note))
#else
#define TARN_THREAD_NOTE(note)
#endif

// On a class that is a lock, and on its operations: this one takes it, that one lets go of it.
#define TARN_CAPABILITY TARN_THREAD_NOTE(capability("mutex"))
#define TARN_ACQUIRE() TARN_THREAD_NOTE(acquire_capability())
#define TARN_RELEASE() TARN_THREAD_NOTE(release_capability())
// On a member: touched only with this lock held. On an operation: called only with it held.
#define TARN_GUARDED_BY(mutex) TARN_THREAD_NOTE(guarded_by(mutex))
#define TARN_REQUIRES(mutex) TARN_THREAD_NOTE(requires_capability(mutex))
// For a function that reads without the lock what cannot change meanwhile; the reason stands beside it.
#define TARN_UNCHECKED TARN_THREAD_NOTE(no_thread_safety_analysis)

namespace tarn {

// std::mutex with its notes: what the product's classes lock with. A thread that holds it must not take it again. It
// guards what says so by TARN_GUARDED_BY, and nothing else.
class TARN_CAPABILITY Mutex {
 public:
  Mutex() = default;
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;

  // Prefer MutexLock, which can't forget the other half.
  void lock() TARN_ACQUIRE() { mutex_.lock(); }
  void unlock() TARN_RELEASE() { mutex_.unlock(); }
  // Whether it got the lock, without waiting for it.
  bool tryLock() TARN_THREAD_NOTE(try_acquire_capability(true)) { return mutex_.try_lock(); }

 private:
  // Which lends the std::mutex to the standard's own condition variable.
  friend class ConditionVariable;

  std::mutex mutex_;
};

// A lock that its holder may take again, for interfaces whose callbacks come within a call.
class TARN_CAPABILITY RecursiveMutex {
 public:
  RecursiveMutex() = default;
  RecursiveMutex(const RecursiveMutex&) = delete;
  RecursiveMutex& operator=(const RecursiveMutex&) = delete;

  void lock() TARN_ACQUIRE() { mutex_.lock(); }
  void unlock() TARN_RELEASE() { mutex_.unlock(); }

 private:
  std::recursive_mutex mutex_;
};

// Holds a lock to the end of its scope: a mutex, or an object that is its own lock.
template <class Lock>
class TARN_THREAD_NOTE(scoped_lockable) MutexLock {
 public:
  // Waits for the lock; the lock outlives this.
  explicit MutexLock(Lock& mutex) TARN_THREAD_NOTE(acquire_capability(mutex)) : mutex_(mutex) { mutex_.lock(); }
  MutexLock(const MutexLock&) = delete;
  MutexLock& operator=(const MutexLock&) = delete;
  ~MutexLock() TARN_THREAD_NOTE(release_capability()) { mutex_.unlock(); }

 private:
  Lock& mutex_;
};

// std::condition_variable on such a lock, which is held before and after each wait and free meanwhile. A predicate says
// that it runs under the lock: [this]() TARN_REQUIRES(mutex_) { return stopping_; }
class ConditionVariable {
 public:
  // May be called with or without the lock. Nothing is remembered: who waits later isn't woken by it.
  void notifyOne() noexcept { variable_.notify_one(); }
  void notifyAll() noexcept { variable_.notify_all(); }

  // Until it is notified, or without any reason, as condition variables may; so who calls it looks in a loop.
  void wait(Mutex& mutex) TARN_REQUIRES(mutex) {
    Lent lent(mutex.mutex_);
    variable_.wait(lent.lock);
  }
  template <class Predicate>
  // Until the predicate holds; it is asked at once, and after each wake-up.
  void wait(Mutex& mutex, Predicate predicate) TARN_REQUIRES(mutex) {
    Lent lent(mutex.mutex_);
    variable_.wait(lent.lock, std::move(predicate));
  }
  // The longest wait, from now, on a clock that nobody sets. Those with a time are false when it was up: without a
  // predicate, whatever else holds; with one, if it doesn't hold.
  template <class Duration>
  bool waitFor(Mutex& mutex, const Duration& longest) TARN_REQUIRES(mutex) {
    Lent lent(mutex.mutex_);
    return variable_.wait_for(lent.lock, longest) == std::cv_status::no_timeout;
  }
  template <class Duration, class Predicate>
  bool waitFor(Mutex& mutex, const Duration& longest, Predicate predicate) TARN_REQUIRES(mutex) {
    Lent lent(mutex.mutex_);
    return variable_.wait_for(lent.lock, longest, std::move(predicate));
  }
  // Until a moment of the clock that `moment` belongs to.
  template <class Moment>
  bool waitUntil(Mutex& mutex, const Moment& moment) TARN_REQUIRES(mutex) {
    Lent lent(mutex.mutex_);
    return variable_.wait_until(lent.lock, moment) == std::cv_status::no_timeout;
  }

 private:
  // The caller's lock, in the shape that the standard wants.
  struct Lent {
    explicit Lent(std::mutex& mutex) : lock(mutex, std::adopt_lock) {}
    Lent(const Lent&) = delete;
    Lent& operator=(const Lent&) = delete;
    ~Lent() { lock.release(); }

    std::unique_lock<std::mutex> lock;
  };

  std::condition_variable variable_;
};

}  // namespace tarn
