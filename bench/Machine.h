// SPDX-License-Identifier: Apache-2.0
// Machine: how fast the machine is at this moment, by work that knows nothing of the service, so that a run on a slow
// or busy one isn't taken for a slow service.
#pragma once

#include <string>
#include <vector>

namespace tarn::bench {

struct MachineSpeed {
  std::string processor;  // its model, as the system names it
  double load = 0;        // over the last minute
  double roundTrip = 0;   // seconds, of the bare peer on one processor
  double work = 0;        // seconds, of a fixed piece of arithmetic
};

// Takes a tenth of a second on a quiet machine.
MachineSpeed measureMachine();

// The speed that is kept in a file; the error names the file.
MachineSpeed readSpeed(const std::string& file, std::string& error);
std::string speedJson(const MachineSpeed& speed);

// What to mind where one of them is slower than the kept one by a quarter or more people work at it than it has
// processors; empty: nothing.
std::string warningOf(const std::vector<MachineSpeed>& now, const MachineSpeed& kept);

}  // namespace tarn::bench
