// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Table.h"

namespace tarn::report {

namespace {

void cell(Markup& markup, const Cell& cell) {
  if (cell.isNumber) {
    markup.element("td", {{"class", "n"}}, cell.text);
  } else {
    markup.element("td", {}, cell.text);
  }
}

}  // namespace

Table::Table(Markup& markup, const std::string& caption, std::initializer_list<const char*> headings)
    : markup_(markup) {
  markup_.line().open("div", {{"class", "wide"}}).open("table").element("caption", {}, caption);
  markup_.open("thead").open("tr");
  for (const char* heading : headings) {
    markup_.element("th", {{"scope", "col"}}, heading);
  }
  markup_.close().close().open("tbody");
}

Table::~Table() {
  markup_.close().close().close();
}

void Table::row(const std::vector<Cell>& cells, const std::string& link) {
  markup_.line().open("tr");
  bool isFirst = true;
  for (const Cell& each : cells) {
    if (!isFirst) {
      cell(markup_, each);
      continue;
    }
    isFirst = false;
    markup_.open("th", {{"scope", "row"}});
    if (link.empty()) {
      markup_.text(each.text).close();
    } else {
      markup_.element("a", {{"href", link}}, each.text).close();
    }
  }
  markup_.close();
}

FactTable::FactTable(Markup& markup, const std::string& caption) : markup_(markup) {
  markup_.line().open("table", {{"class", "facts"}}).element("caption", {}, caption).open("tbody");
}

FactTable::~FactTable() {
  markup_.close().close();
}

void FactTable::row(const std::string& what, const Cell& value) {
  markup_.line().open("tr").element("th", {{"scope", "row"}}, what);
  cell(markup_, value);
  markup_.close();
}

}  // namespace tarn::report
