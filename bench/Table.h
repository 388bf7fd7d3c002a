// SPDX-License-Identifier: Apache-2.0
// Table: the one table that the program prints: a row for each figure and each peer or limit that it stands beside.
#pragma once

#include <optional>
#include <ostream>
#include <string>
#include <vector>

namespace tarn::bench {

struct Row {
  std::string figure;
  std::string ours;
  std::string peer;    // what was measured beside it in the same run, with its name
  std::string ratio;   // ours to the peer's
  std::string target;  // empty: none on this row
  std::optional<bool> met;
};

class Table {
 public:
  void add(Row row) { rows_.push_back(std::move(row)); }
  // A row with a target that ours must not exceed, or reach when `atLeast`.
  void addWithTarget(Row row, double ours, double target, bool atLeast = false) {
    row.met = atLeast ? ours >= target : ours <= target;
    add(std::move(row));
  }
  void print(std::ostream& out) const;

 private:
  std::vector<Row> rows_;
};

}  // namespace tarn::bench
