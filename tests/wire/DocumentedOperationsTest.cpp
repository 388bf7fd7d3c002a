// SPDX-License-Identifier: Apache-2.0
// docs/wire.md tells clients of any language which operations there are: its table is kOperations, row by row.

#include <gtest/gtest.h>

#include <array>
#include <fstream>
#include <string>
#include <vector>

#include "wire/Operation.h"
#include "wire/Request.h"

namespace tarn::wire {
namespace {

using Cells = std::vector<std::string>;

// The cells of a table's line, without the blanks around them.
Cells cellsOf(const std::string& line) {
  Cells cells;
  for (std::size_t at = line.find('|'); at + 1 < line.size();) {
    const std::size_t end = line.find('|', at + 1);
    cells.push_back(line.substr(at + 2, end - at - 3));
    at = end;
  }
  return cells;
}

// The rows of the table of operations, its head left out.
std::vector<Cells> documentedRows() {
  std::ifstream file(TARN_WIRE_DOCUMENT);
  std::vector<Cells> rows;
  bool inTable = false;
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with("| number | operation |")) {
      inTable = true;
    } else if (inTable && !line.starts_with('|')) {
      break;
    } else if (inTable && !line.starts_with("|---")) {
      rows.push_back(cellsOf(line));
    }
  }
  return rows;
}

std::string documentedArguments(const ArgumentList& arguments) {
  // In the order of Argument; which dictionary it is the operation tells.
  constexpr std::array kNames = {
      "reporter ID", "service type", "dictionary", "dictionary", "category", "type", "array of reporter IDs or null",
      "dictionary"};
  static_assert(kNames.size() == kArguments.size());
  std::string text;
  for (const Argument argument : arguments) {
    text += text.empty() ? "" : ", ";
    text += kNames[static_cast<std::size_t>(argument)];
  }
  return text.empty() ? "none" : text;
}

// How the cell of a result begins; what else it says tells what the result means.
std::string documentedResult(Result result) {
  switch (result) {
    case Result::NoReply:
      return "no reply: the service ends";
    case Result::Nothing:
      return "none";
    case Result::True:
      return "true";
    case Result::TrueAtStop:
      return "true, when the session stops";
    case Result::Number:
      return "a number: ";
    case Result::Dictionary:
      return "a dictionary";
    case Result::Numbers:
      return "array of ";
  }
  return "?";
}

bool goesOn(Result result) {
  return result == Result::Number || result == Result::Dictionary || result == Result::Numbers;
}

TEST(DocumentedOperations, AreThoseOfTheTableInItsOrder) {
  const std::vector<Cells> rows = documentedRows();
  ASSERT_EQ(rows.size(), kOperations.size());
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const OperationRow& row = kOperations[i];
    ASSERT_EQ(rows[i].size(), 4U) << row.name;
    EXPECT_EQ(rows[i][0], std::to_string(numberOf(row.operation))) << row.name;
    EXPECT_EQ(rows[i][1], '`' + std::string(row.name) + '`');
    EXPECT_EQ(rows[i][2], documentedArguments(row.arguments)) << row.name;
    const std::string result = documentedResult(row.result);
    EXPECT_EQ(goesOn(row.result) ? rows[i][3].substr(0, result.size()) : rows[i][3], result) << row.name;
  }
}

}  // namespace
}  // namespace tarn::wire
