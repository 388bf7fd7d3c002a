// SPDX-License-Identifier: Apache-2.0
// TextTable: rows in columns, as wide as what stands in them and no wider than the terminal.
//
// All rows are held until they are printed. Threads: one.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "tools/ctl/terminal/Output.h"
#include "tools/ctl/terminal/Terminal.h"

namespace tarn::ctl {

class TextTable {
 public:
  struct Column {
    std::string heading;
    bool isNumber = false;   // stands to the right
    bool mayShrink = false;  // where the terminal is too narrow
  };
  struct Cell {
    std::string text;  // anybody's: it is made printable here
    Paint paint = Paint::Plain;
  };

  explicit TextTable(std::vector<Column> columns) : columns_(std::move(columns)) {}
  TextTable(const TextTable&) = delete;
  TextTable& operator=(const TextTable&) = delete;

  // With as many cells as there are columns.
  void add(std::vector<Cell> row);
  bool empty() const noexcept { return rows_.empty(); }
  // The headings, unless it is to be quiet, then the rows, each after `indent`. Without rows nothing.
  void print(Output& output, const Terminal& terminal, const std::string& indent = {}) const;

 private:
  std::vector<std::size_t> widths(const Terminal& terminal, std::size_t indent) const;
  std::string line(const std::vector<Cell>& row, const std::vector<std::size_t>& widths,
                   const Terminal& terminal) const;

  std::vector<Column> columns_;
  std::vector<std::vector<Cell>> rows_;
};

}  // namespace tarn::ctl
