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

// What the end of the program waits for at the most, so that the service has taken everything.
constexpr std::uint32_t kCloseMilliseconds = 2000;
constexpr long kFirstPauseMilliseconds = 125;
constexpr int kMostDoublings = 5;

}  // namespace

Program::Program(const AdapterOptions& options, const Rules& rules)
    : options_(options), log_(options.logLevel), book_(rules) {
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
  if (!open()) return kExitFailure;
  if (!options_.print) {
    reporter_ = std::make_unique<Reporter>();
    if (const Status opened = reporter_->open(options_.socket); opened.failed()) {
      log_.write(LogLevel::Error, "can't report: " + opened->text);
      return kExitFailure;
    }
  }
  connect();
  if (status_ == 0) {
    pw_main_loop_run(loop_);
  }
  forgetGraph();
  if (reporter_) {
    tellLosses();
    const std::uint64_t left = reporter_->close(kCloseMilliseconds);
    if (left > 0) {
      log_.write(LogLevel::Default, std::to_string(left) + " messages were left, since no service took them");
    }
  }
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
  const Actions actions = book_.take();
  if (options_.once || actions.empty()) return;
  if (reporter_) {
    reporter_->carryOut(actions);
    tellLosses();
    return;
  }
  for (const Action& action : actions) {
    std::fputs(scriptOf(action).c_str(), stdout);
  }
  std::fflush(stdout);
}

// The first, and then whenever they have doubled.
void Program::tellLosses() {
  const Reporter::Counts& counts = reporter_->counts();
  const std::uint64_t refused = reporter_->refused();
  const std::uint64_t losses = counts.lost + counts.leftOut + refused;
  if (losses == 0 || losses < 2 * toldLosses_) return;
  toldLosses_ = losses;
  const std::string why = counts.lastRefusal.empty() ? reporter_->lastError() : counts.lastRefusal;
  log_.write(LogLevel::Default, "not reported so far: " + std::to_string(counts.lost) + " messages, " +
                                    std::to_string(counts.leftOut) + " sessions while no service answered, " +
                                    std::to_string(refused) + " requests that it refused (" + why + ")");
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
