// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/Program.h"

#include <pipewire/impl.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <system_error>
#include <utility>

#include "adapters/pipewire/ActionScript.h"

namespace tarn::streams {

namespace {

constexpr long kFirstPauseMilliseconds = 125;
constexpr int kMostDoublings = 5;

}  // namespace

Program::Program(const AdapterOptions& options, const Rules& rules)
    : options_(options), log_(Adapter::PipeWire, options.logLevel), outlet_(options_, log_), book_(rules) {
  loop_ = pw_main_loop_new(nullptr);
  // Of PipeWire's own configuration nothing is needed, and its modules would take memory and a data thread's rank.
  pw_properties* const properties = pw_properties_new(PW_KEY_CONFIG_NAME, "null", nullptr);
  context_ = loop_ == nullptr ? nullptr : pw_context_new(pw_main_loop_get_loop(loop_), properties, 0);
  if (context_ != nullptr) {
    watcher_ = std::make_unique<GraphWatcher>(context_, book_, static_cast<GraphWatcher::Listener&>(*this),
                                              options_.remote, rules.profiler);
  }
}

Program::~Program() {
  watcher_.reset();
  if (context_ != nullptr) {
    pw_context_destroy(context_);
  }
  if (loop_ != nullptr) {
    pw_main_loop_destroy(loop_);
  }
}

int Program::run() {
  if (!open() || !outlet_.open()) return kExitFailure;
  connect();
  if (status_ == 0) {
    pw_main_loop_run(loop_);
  }
  forgetGraph();
  outlet_.close();
  return status_;
}

bool Program::open() {
  // As few as can be: what speaks to PipeWire, and what knows the objects that aren't its core's.
  constexpr const char* kModules[] = {"libpipewire-module-protocol-native", "libpipewire-module-metadata",
                                      "libpipewire-module-profiler"};
  for (const char* const module : kModules) {
    if (context_ == nullptr || pw_context_load_module(context_, module, nullptr, nullptr) == nullptr) {
      log_.write(LogLevel::Error, std::string("PipeWire's library can't be used: ") + module + ": " +
                                      std::generic_category().message(errno));
      return false;
    }
  }
  pw_loop* const loop = pw_main_loop_get_loop(loop_);
  timer_ = pw_loop_add_timer(loop, &Program::due, this);
  pw_loop_add_signal(loop, SIGINT, &Program::signalled, this);
  pw_loop_add_signal(loop, SIGTERM, &Program::signalled, this);
  return timer_ != nullptr;
}

void Program::connect() {
  if (watcher_->connect()) {
    log_.write(LogLevel::Debug, "looking at PipeWire");
    attempts_ = 0;
    return;
  }
  const std::string why = "no PipeWire answers: " + std::generic_category().message(errno);
  if (options_.once) {
    log_.write(LogLevel::Error, why);
    stop(kExitFailure);
    return;
  }
  log_.write(attempts_ == 0 ? LogLevel::Default : LogLevel::Debug, why);
  connectLater();
}

void Program::connectLater() {
  const long pause = kFirstPauseMilliseconds << std::min(attempts_++, kMostDoublings);
  timespec wait{pause / 1000, pause % 1000 * 1'000'000};
  pw_loop_update_timer(pw_main_loop_get_loop(loop_), timer_, &wait, nullptr, false);
}

void Program::said(bool isQuiet) {
  if (options_.once && isQuiet) {
    const std::string table = tableOf(book_.look());
    std::fputs(table.c_str(), stdout);
    stop(0);
  }
  carryOut();
}

void Program::lost(const std::string& why) {
  if (isLost_) return;
  log_.write(LogLevel::Default, "PipeWire is gone: " + why);
  book_.end(wallClock(), kPipeWireEnded);
  carryOut();
  isLost_ = true;
  attempts_ = 0;
  if (options_.once) {
    stop(kExitFailure);
  }
  connectLater();
}

void Program::forgetGraph() {
  book_.end(wallClock(), kAdapterEnded);
  carryOut();
  watcher_->disconnect();
}

void Program::carryOut() {
  outlet_.carryOut(book_.take());
}

void Program::stop(int status) {
  status_ = status;
  pw_main_loop_quit(loop_);
}

void Program::signalled(void* data, int) {
  static_cast<Program*>(data)->stop(0);
}

void Program::due(void* data, std::uint64_t) {
  auto& self = *static_cast<Program*>(data);
  if (std::exchange(self.isLost_, false)) {
    self.watcher_->disconnect();
  }
  self.connect();
}

}  // namespace tarn::streams
