// SPDX-License-Identifier: Apache-2.0
// MessageLint: what in a step of a script the service would take and nobody would understand: a number without a name,
// a value of the wrong kind or unit, a key that nobody reads.
//
// Stands on the dictionary alone and talks to no service. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "tools/script/ScriptStep.h"

namespace tarn::ctl {

// Constant once made.
class MessageLint {
 public:
  // `ownKeysAreFine`: a key that nobody reads is a finding only where it looks like one that somebody reads, or is one
  // that the service writes itself.
  explicit MessageLint(bool ownKeysAreFine) : ownKeysAreFine_(ownKeysAreFine) {}

  // A sentence for each thing that is wrong, in the order of the step. Only for lines that type a session, configure it
  // or send a message; none for others. Keys are looked up as the intake makes them, with '_' for blanks.
  std::vector<std::string> findings(const script::ScriptStep& step) const;

 private:
  bool ownKeysAreFine_;
};

}  // namespace tarn::ctl
