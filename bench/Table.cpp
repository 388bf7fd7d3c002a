// SPDX-License-Identifier: Apache-2.0
#include "bench/Table.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace tarn::bench {

namespace {

constexpr std::size_t kColumns = 6;
using Cells = std::array<std::string, kColumns>;

Cells cellsOf(const Row& row) {
  return {row.figure, row.ours, row.peer, row.ratio, row.target, row.met ? (*row.met ? "yes" : "no") : ""};
}

void printLine(std::ostream& out, const Cells& cells, const std::array<std::size_t, kColumns>& widths, char fill) {
  for (std::size_t i = 0; i < kColumns; ++i) {
    out << (i == 0 ? "| " : " | ") << cells[i] << std::string(widths[i] - cells[i].size(), fill);
  }
  out << " |\n";
}

}  // namespace

void Table::print(std::ostream& out) const {
  std::vector<Cells> lines{{"figure", "ours", "peer or limit", "ratio", "target", "met"}};
  std::transform(rows_.begin(), rows_.end(), std::back_inserter(lines), cellsOf);
  std::array<std::size_t, kColumns> widths{};
  for (const Cells& cells : lines) {
    for (std::size_t i = 0; i < kColumns; ++i) {
      widths[i] = std::max(widths[i], cells[i].size());
    }
  }
  for (std::size_t i = 0; i < lines.size(); ++i) {
    printLine(out, lines[i], widths, ' ');
    if (i == 0) {
      printLine(out, Cells{}, widths, '-');
    }
  }
  out.flush();
}

}  // namespace tarn::bench
