// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/ActionOutlet.h"

#include <cstdio>

#include "adapters/pipewire/ActionScript.h"

namespace tarn::streams {

namespace {

// What the end of the program waits for at the most, so that the service has taken everything.
constexpr std::uint32_t kCloseMilliseconds = 2000;

}  // namespace

bool ActionOutlet::open() {
  if (options_.print) return true;
  reporter_.emplace();
  const Status opened = reporter_->open(options_.socket);
  if (opened.failed()) {
    log_.write(LogLevel::Error, "can't report: " + opened->text);
  }
  return !opened.failed();
}

void ActionOutlet::carryOut(const Actions& actions) {
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

void ActionOutlet::close() {
  if (!reporter_) return;
  tellLosses();
  const std::uint64_t left = reporter_->close(kCloseMilliseconds);
  if (left > 0) {
    log_.write(LogLevel::Default, std::to_string(left) + " messages were left, since no service took them");
  }
}

// The first, and then whenever they have doubled.
void ActionOutlet::tellLosses() {
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

}  // namespace tarn::streams
