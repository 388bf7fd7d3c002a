// SPDX-License-Identifier: Apache-2.0
// Table: a table of a page, with its caption and its headings. Owner: who writes it. Threads: one at a time.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

#include "tools/report/Markup.h"
#include "tools/report/Texts.h"

namespace tarn::report {

// A text stands at the left of its cell, a number at the right.
struct Cell {
  // NOLINTBEGIN(google-explicit-constructor): a row is a list of whatever stands in it
  Cell(std::string content) : text(std::move(content)) {}
  Cell(const char* content) : text(content) {}
  Cell(double number) : text(numberText(number)), isNumber(true) {}
  Cell(std::int64_t number) : text(numberText(number)), isNumber(true) {}
  // NOLINTEND(google-explicit-constructor)

  std::string text;
  bool isNumber = false;
};

class Table {
 public:
  // Opens it; the destructor closes it.
  Table(Markup& markup, const std::string& caption, std::initializer_list<const char*> headings);
  ~Table();
  Table(const Table&) = delete;
  Table& operator=(const Table&) = delete;

  // The first cell is the row's heading. With a link that cell leads there: "#session-12".
  void row(const std::vector<Cell>& cells, const std::string& link = {});

 private:
  Markup& markup_;
};

// A table without headings above: what it is, and its value.
class FactTable {
 public:
  FactTable(Markup& markup, const std::string& caption);
  ~FactTable();
  FactTable(const FactTable&) = delete;
  FactTable& operator=(const FactTable&) = delete;

  void row(const std::string& what, const Cell& value);

 private:
  Markup& markup_;
};

}  // namespace tarn::report
