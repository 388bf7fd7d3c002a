// SPDX-License-Identifier: Apache-2.0
// Terminal: what results are printed on, and how they may look there. Stateless. Threads: one.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

#include "tools/ctl/terminal/Progress.h"

namespace tarn::ctl {

enum class ColorChoice { Auto, Always, Never };

// What the machine tells of where results and complaints go.
struct TerminalFacts {
  bool isTerminal = false;                  // stdout
  bool hasComplaintsOnTerminal = false;     // stderr
  std::optional<std::size_t> columns = {};  // as the terminal tells
  // Variables; empty when they aren't set.
  std::string columnsVariable = {};  // COLUMNS
  std::string noColor = {};          // NO_COLOR
  std::string type = {};             // TERM
};
// Of this process.
TerminalFacts currentTerminal();

// How to print there.
struct Terminal {
  bool color = false;
  bool quiet = false;                     // no headings and no remarks: results alone
  std::optional<std::size_t> width = {};  // nothing: lines may be as long as they like
  // While results are gathered; and while they are printed, which would stand between them on the same terminal.
  ProgressPlace progress = {};
  ProgressPlace printingProgress = {};
};
// Colours, unless a choice was made, on a terminal that isn't a dumb one, when NO_COLOR is not set. COLUMNS goes before
// what the terminal says; what isn't a terminal and has no COLUMNS has no width. Progress is for a stderr that is a
// terminal and no dumb one, unless it is to be quiet.
Terminal terminalOf(const TerminalFacts& facts, ColorChoice choice, bool quiet);

enum class Paint { Plain, Bold, Dim, Red, Yellow, Green };
// The text between what switches the paint on and off; as it is where there are no colours.
std::string painted(std::string_view text, Paint paint, const Terminal& terminal);

// Columns that a printable text takes: its characters.
std::size_t widthOf(std::string_view text) noexcept;
// The text in at most so many columns; one that is cut ends with an ellipsis.
std::string fitted(std::string_view text, std::size_t width);

}  // namespace tarn::ctl
