// OwnerCheck: the rule that one thread at a time uses a client, made executable. Breaking it is a bug of the owner that
// would corrupt the stream, so it ends the process with a message.
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

   private:
    OwnerCheck& check_;
    bool outermost_;
  };

  // Ends the process: `operation` isn't allowed inside a handler.
  [[noreturn]] static void failInsideHandler(const char* operation) noexcept;

 private:
  std::atomic<std::thread::id> user_{};
};

}  // namespace tarn::client
