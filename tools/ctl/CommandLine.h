// SPDX-License-Identifier: Apache-2.0
// CommandLine: the commands and options of tarnreportingctl, of which its help, its manual page and its completions are
// made.
//
// Threads: one.
#pragma once

#include <optional>
#include <string>

#include "tools/ctl/Command.h"

namespace tarn::ctl {

// What all commands take, beside what Context holds.
struct Options {
  std::string socket;
  bool admin = false;
  double timeout = 5;
  std::optional<double> wait;
  std::string color = "auto";
  bool quiet = false;
};

// Puts them into `app`, which both outlive; `version` is what --version tells.
void describeCommandLine(CLI::App& app, Context& context, Options& options, const std::string& version);

}  // namespace tarn::ctl
