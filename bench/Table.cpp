// SPDX-License-Identifier: Apache-2.0
#include "bench/Table.h"

#include <algorithm>
#include <iterator>

namespace tarn::bench {

namespace {

std::string textOf(const Beside& peer) {
  return peer.name.empty() ? "" : peer.name + " " + peer.quantity.text + peer.remark;
}

std::vector<std::string> cellsOf(const Row& row) {
  const std::string met = row.met ? (*row.met ? "yes" : "no") : "";
  return {row.figure, row.ours.text, textOf(row.peer), row.ratio.text, row.target, met};
}

void printLine(std::ostream& out, const std::vector<std::string>& cells, const std::vector<std::size_t>& widths,
               char fill) {
  for (std::size_t i = 0; i < widths.size(); ++i) {
    out << (i == 0 ? "| " : " | ") << cells[i] << std::string(widths[i] - cells[i].size(), fill);
  }
  out << " |\n";
}

}  // namespace

void printAligned(std::ostream& out, const std::vector<std::vector<std::string>>& lines) {
  std::vector<std::size_t> widths(lines.front().size());
  for (const std::vector<std::string>& cells : lines) {
    for (std::size_t i = 0; i < widths.size(); ++i) {
      widths[i] = std::max(widths[i], cells[i].size());
    }
  }
  for (std::size_t i = 0; i < lines.size(); ++i) {
    printLine(out, lines[i], widths, ' ');
    if (i == 0) {
      printLine(out, std::vector<std::string>(widths.size()), widths, '-');
    }
  }
  out.flush();
}

void Table::print(std::ostream& out) const {
  std::vector<std::vector<std::string>> lines{{"figure", "ours", "peer or limit", "ratio", "target", "met"}};
  std::transform(rows_.begin(), rows_.end(), std::back_inserter(lines), cellsOf);
  printAligned(out, lines);
}

}  // namespace tarn::bench
