// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/TextTable.h"

#include <algorithm>
#include <numeric>
#include <utility>

namespace tarn::ctl {

namespace {

constexpr std::size_t kGap = 2;
// A column that shrinks keeps so much.
constexpr std::size_t kLeastWidth = 8;

}  // namespace

void TextTable::add(std::vector<Cell> row) {
  for (Cell& cell : row) {
    cell.text = printable(cell.text);
  }
  rows_.push_back(std::move(row));
}

std::vector<std::size_t> TextTable::widths(const Terminal& terminal, std::size_t indent) const {
  std::vector<std::size_t> widths;
  for (std::size_t i = 0; i < columns_.size(); ++i) {
    std::size_t width = terminal.quiet ? 0 : widthOf(columns_[i].heading);
    for (const auto& row : rows_) {
      width = std::max(width, widthOf(row[i].text));
    }
    widths.push_back(width);
  }
  if (!terminal.width) return widths;
  std::size_t total = std::accumulate(widths.begin(), widths.end(), indent + kGap * (widths.size() - 1));
  // The widest gives way first.
  while (total > *terminal.width) {
    std::size_t* widest = nullptr;
    for (std::size_t i = 0; i < columns_.size(); ++i) {
      const bool gives = columns_[i].mayShrink && widths[i] > kLeastWidth;
      widest = gives && (widest == nullptr || widths[i] > *widest) ? &widths[i] : widest;
    }
    if (widest == nullptr) break;
    --*widest;
    --total;
  }
  return widths;
}

std::string TextTable::line(const std::vector<Cell>& row, const std::vector<std::size_t>& widths,
                            const Terminal& terminal) const {
  std::string line;
  for (std::size_t i = 0; i < row.size(); ++i) {
    const std::string text = columns_[i].mayShrink ? fitted(row[i].text, widths[i]) : row[i].text;
    const std::string padding(widths[i] - std::min(widths[i], widthOf(text)), ' ');
    const bool isLast = i + 1 == row.size();
    line += columns_[i].isNumber ? padding : "";
    line += painted(text, row[i].paint, terminal);
    line += columns_[i].isNumber || isLast ? "" : padding;
    line += isLast ? "" : std::string(kGap, ' ');
  }
  return line;
}

void TextTable::print(Output& output, const Terminal& terminal, const std::string& indent) const {
  if (rows_.empty()) return;
  const std::vector<std::size_t> columns = widths(terminal, indent.size());
  if (!terminal.quiet) {
    std::vector<Cell> headings;
    for (const Column& column : columns_) {
      headings.push_back({column.heading, Paint::Bold});
    }
    output.paintedLine(indent + line(headings, columns, terminal));
  }
  for (const auto& row : rows_) {
    if (!output.paintedLine(indent + line(row, columns, terminal))) return;
  }
}

}  // namespace tarn::ctl
