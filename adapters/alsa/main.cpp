// SPDX-License-Identifier: Apache-2.0
// tarnreporting-alsa: options, configuration, then a look at the sound cards from time to time. docs/alsa.md is its
// manual.
#include <sys/prctl.h>

#include <csignal>
#include <cstdio>
#include <ctime>

#include "adapters/alsa/AlsaTree.h"
#include "adapters/alsa/SubDeviceBook.h"
#include "adapters/pipewire/ActionOutlet.h"
#include "adapters/pipewire/ActionScript.h"
#include "adapters/pipewire/AdapterStart.h"

namespace tarn::streams {
namespace {

// A look may be late by so much, so that the machine wakes up for several things at once.
constexpr unsigned long kSlackNanoseconds = 50'000'000;

Moment wallClock() {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  return now.tv_sec * Moment{1'000'000'000} + now.tv_nsec;
}

// Whether a signal that ends the program came meanwhile.
bool sleepFor(std::int64_t milliseconds) {
  const sigset_t signals = endSignals();
  const timespec pause{milliseconds / 1000, milliseconds % 1000 * 1'000'000};
  return ::sigtimedwait(&signals, nullptr, &pause) > 0;
}

int runAdapter(const AdapterOptions& options, const Rules& rules) {
  const AdapterLog log(Adapter::Alsa, options.logLevel);
  ActionOutlet outlet(options, log);
  StreamBook book(rules);
  SubDeviceBook subDevices(book);
  AlsaTree tree(options.proc);
  if (!outlet.open()) return kExitFailure;
  ::prctl(PR_SET_TIMERSLACK, kSlackNanoseconds, 0, 0, 0);
  bool hadCards = true;
  do {
    subDevices.looked(tree.look(), wallClock());
    if (options.once) {
      std::fputs(tableOf(book.look()).c_str(), stdout);
      return 0;
    }
    if (tree.hasCards() != std::exchange(hadCards, tree.hasCards())) {
      log.write(LogLevel::Default, hadCards ? "there is a sound card now" : "there is no sound card");
    }
    outlet.carryOut(book.take());
  } while (!sleepFor(options.intervalMilliseconds));
  book.end(wallClock(), kAdapterEnded);
  outlet.carryOut(book.take());
  outlet.close();
  return 0;
}

}  // namespace
}  // namespace tarn::streams

int main(int argumentCount, char** arguments) {
  using namespace tarn::streams;
  return startAdapter(Adapter::Alsa, argumentCount, arguments, runAdapter);
}
