// SPDX-License-Identifier: Apache-2.0
// SignalSource: SIGTERM, SIGINT and SIGHUP as calls on the main loop's thread; SIGPIPE is ignored for the whole
// process, so that a peer that has gone is an error of the write.
//
// Made by the entry point before any thread, which then inherits the blocked signals: a thread without that would take
// the signal and end the process. Threads: the loop's.
#pragma once

#include <memory>

#include "host/loop/MainLoop.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class SignalSource final : public EventHandler {
 public:
  using Handler = platform::UniqueFunction<void(int signal)>;

  // Blocks the signals for the calling thread and every one that it makes later. No handler is called yet; a signal
  // that comes now waits for start(). They stay blocked after this object's end.
  SignalSource();
  SignalSource(const SignalSource&) = delete;
  SignalSource& operator=(const SignalSource&) = delete;

  // Calls `handler` for every signal from now on, those that came before included; several of one kind that came
  // together may be one call. Fails with "can't receive signals: why" when the system gives no descriptor. The loop
  // holds `source` from here on.
  [[nodiscard]] static Status start(const std::shared_ptr<SignalSource>& source, MainLoop& loop, Handler handler);

  // Reads all signals that wait and calls the handler for each.
  void handleEvents(std::uint32_t events) override;

 private:
  // A signalfd, from start() on.
  UniqueDescriptor descriptor_;
  // From start() on, for the life of the process.
  Handler handler_;
};

}  // namespace tarn::linux_host
