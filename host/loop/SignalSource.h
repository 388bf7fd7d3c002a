// SignalSource: SIGTERM and SIGINT as calls on the main loop's thread; SIGPIPE is ignored for the whole process.
//
// Made by the entry point before any thread, which then inherits the blocked signals. Threads: the loop's.
#pragma once

#include <memory>

#include "host/loop/MainLoop.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class SignalSource final : public EventHandler {
 public:
  using Handler = platform::UniqueFunction<void(int signal)>;

  // Blocks the signals for the calling thread and every one that it makes later. No handler is called yet.
  SignalSource();
  SignalSource(const SignalSource&) = delete;
  SignalSource& operator=(const SignalSource&) = delete;

  // Calls `handler` for every signal from now on, those that came before included.
  [[nodiscard]] static Status start(const std::shared_ptr<SignalSource>& source, MainLoop& loop, Handler handler);

  void handleEvents(std::uint32_t events) override;

 private:
  UniqueDescriptor descriptor_;
  Handler handler_;
};

}  // namespace tarn::linux_host
