// OwnerCheck: the rule that one thread at a time uses a client, made executable. An operation of a second thread would
// corrupt the stream, so it isn't let in and answers that it was misused.
#pragma once

#include <atomic>
#include <thread>

namespace tarn::client {

class OwnerCheck {
 public:
  OwnerCheck() = default;
  OwnerCheck(const OwnerCheck&) = delete;
  OwnerCheck& operator=(const OwnerCheck&) = delete;

  // Held for the length of one operation; operations inside each other on one thread are fine.
  class Use {
   public:
    explicit Use(OwnerCheck& check) noexcept;
    ~Use();
    Use(const Use&) = delete;
    Use& operator=(const Use&) = delete;

    // Whether the operation may go on.
    bool granted() const noexcept { return granted_; }

   private:
    OwnerCheck& check_;
    bool granted_ = true;
    bool outermost_ = true;
  };

 private:
  std::atomic<std::thread::id> user_{};
};

}  // namespace tarn::client
