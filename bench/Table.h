// SPDX-License-Identifier: Apache-2.0
// Table: the one table that the program prints: a row for each figure and each peer or limit that it stands beside.
#pragma once

#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "bench/Quantity.h"

namespace tarn::bench {

struct Row {
  std::string figure;
  Quantity ours;
  Beside peer;  // what was measured beside it in the same run
  Ratio ratio;
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
  const std::vector<Row>& rows() const noexcept { return rows_; }
  void print(std::ostream& out) const;

 private:
  std::vector<Row> rows_;
};

// The first line is the head; each has as many cells as that.
void printAligned(std::ostream& out, const std::vector<std::vector<std::string>>& lines);

}  // namespace tarn::bench
