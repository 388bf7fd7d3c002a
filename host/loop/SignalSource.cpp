// SPDX-License-Identifier: Apache-2.0
#include "host/loop/SignalSource.h"

#include <sys/epoll.h>
#include <sys/signalfd.h>

#include <cerrno>
#include <csignal>

#include "host/system/SystemError.h"

namespace tarn::linux_host {

namespace {

sigset_t servedSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGTERM);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGHUP);
  return signals;
}

}  // namespace

SignalSource::SignalSource() {
  const sigset_t signals = servedSignals();
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  std::signal(SIGPIPE, SIG_IGN);
}

Status SignalSource::start(const std::shared_ptr<SignalSource>& source, MainLoop& loop, Handler handler) {
  const sigset_t signals = servedSignals();
  source->handler_ = std::move(handler);
  source->descriptor_ = UniqueDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
  const Status watched =
      source->descriptor_ ? loop.watch(source->descriptor_.get(), EPOLLIN, source) : lastSystemError();
  return watched.ok() ? Status() : errorOf("can't receive signals", *watched);
}

void SignalSource::handleEvents(std::uint32_t) {
  signalfd_siginfo info{};
  while (::read(descriptor_.get(), &info, sizeof info) == static_cast<ssize_t>(sizeof info)) {
    handler_(static_cast<int>(info.ssi_signo));
  }
}

}  // namespace tarn::linux_host
