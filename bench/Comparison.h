// SPDX-License-Identifier: Apache-2.0
// What becomes of a run beside its table: a file of it, and the table beside an earlier run's file.
#pragma once

#include <map>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "bench/Machine.h"
#include "bench/Quantity.h"
#include "bench/Table.h"

namespace tarn::bench {

struct RunAbout {
  std::string service;  // its version line
  std::string date;     // UTC, "2026-11-23T20:00:00Z"
  int rounds = 0;
  bool quick = false;
  std::string disk;
  std::vector<MachineSpeed> machine;  // before and after
};

// One JSON object: what the run was, and each row with its numbers. docs/benchmarks.md lists the members.
std::string runJson(const RunAbout& about, const Table& table);

// A run that was kept.
struct KeptRun {
  struct Figure {
    Quantity ours;
    Ratio ratio;
  };
  std::string service;
  std::string date;
  bool quick = false;
  std::map<std::pair<std::string, std::string>, Figure> figures;  // by figure and name of the peer
};
// The error names the file, and what is wrong with it.
KeptRun readRun(const std::string& file, std::string& error);

// Each row of the table that the kept run has too: then, now, and how they differ. By ratios where there are some, as
// they hold on another machine; a difference within the rounds' spread is marked as none.
void printComparison(std::ostream& out, const KeptRun& then, const Table& now);

}  // namespace tarn::bench
