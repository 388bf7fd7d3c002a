// PayloadRules: how a recorded payload is set against an expected one when parts of it are only known by having played:
// stamps that the service made, and what a summary says about the machine and the client.
#pragma once

#include <string>
#include <utility>

#include "tests/scenario/Model.h"

namespace tarn::scenario {

// What can only be known by having played the scripts.
struct Circumstances {
  double startedAt = 0;  // epoch seconds
  double endedAt = 0;
  std::string clientProcessName;  // of every client
};

class PayloadRules {
 public:
  // Clocks are read at several places.
  static constexpr double kClockSlackSeconds = 1;

  explicit PayloadRules(Circumstances circumstances) : circumstances_(std::move(circumstances)) {}

  // How `payload` differs from the expected event's; empty when it doesn't.
  std::string differenceOf(const ExpectedEvent& expected, json payload) const;
  bool isClientName(const json& name) const;
  const Circumstances& circumstances() const { return circumstances_; }

 private:
  bool takeFreshStamp(json& payload) const;
  std::string takeMachineFacts(json& payload) const;

  Circumstances circumstances_;
};

}  // namespace tarn::scenario
