// SPDX-License-Identifier: Apache-2.0
// OwnerCheck: the rule that one thread at a time uses a client, made executable. An operation of a second thread would
// corrupt the stream, so it isn't let in and answers that it was misused.
//
//   const OwnerCheck::Use use(owner_);
//   if (!use.granted()) return misuse();
//
// It is no lock: nobody waits, and threads may take turns without telling anybody.
#pragma once

#include <atomic>
#include <thread>

namespace tarn::client {

// Costs a compare-and-exchange and a store an operation, and never waits. Owned by the client that it watches over.
class OwnerCheck {
 public:
  OwnerCheck() = default;
  OwnerCheck(const OwnerCheck&) = delete;
  OwnerCheck& operator=(const OwnerCheck&) = delete;

  // Held for the length of one operation; operations inside each other on one thread are fine, since a handler sends
  // from within one. The outermost one lets the next thread in.
  class Use {
   public:
    // Enters, if no other thread is inside; asks nobody to wait.
    explicit Use(OwnerCheck& check) noexcept;
    ~Use();
    Use(const Use&) = delete;
    Use& operator=(const Use&) = delete;

    // Whether the operation may go on.
    bool granted() const noexcept { return granted_; }

   private:
    OwnerCheck& check_;
    // False while another thread is inside.
    bool granted_ = true;
    // Whether the end of this use lets others in.
    bool outermost_ = true;
  };

 private:
  // The thread that is inside an operation; none: no thread.
  std::atomic<std::thread::id> user_{};
};

}  // namespace tarn::client
