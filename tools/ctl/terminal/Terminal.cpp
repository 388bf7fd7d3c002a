// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/Terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>

namespace tarn::ctl {

namespace {

constexpr std::string_view kEllipsis = "\xe2\x80\xa6";

std::string variable(const char* name) {
  const char* const value = std::getenv(name);
  return value == nullptr ? std::string() : std::string(value);
}

std::optional<std::size_t> positiveNumber(std::string_view text) {
  std::size_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  const bool isOne = error == std::errc() && end == text.data() + text.size() && number > 0;
  return isOne ? std::optional(number) : std::nullopt;
}

bool hasColor(const TerminalFacts& facts, ColorChoice choice) {
  if (choice != ColorChoice::Auto) return choice == ColorChoice::Always;
  return facts.isTerminal && facts.noColor.empty() && facts.type != "dumb";
}

constexpr std::string_view codeOf(Paint paint) {
  switch (paint) {
    case Paint::Bold:
      return "\x1b[1m";
    case Paint::Dim:
      return "\x1b[2m";
    case Paint::Red:
      return "\x1b[31m";
    case Paint::Yellow:
      return "\x1b[33m";
    case Paint::Green:
      return "\x1b[32m";
    case Paint::Plain:
      break;
  }
  return {};
}

bool beginsCharacter(char byte) noexcept {
  return (static_cast<unsigned char>(byte) & 0xC0U) != 0x80U;
}

}  // namespace

TerminalFacts currentTerminal() {
  TerminalFacts facts;
  facts.isTerminal = ::isatty(STDOUT_FILENO) == 1;
  facts.hasComplaintsOnTerminal = ::isatty(STDERR_FILENO) == 1;
  winsize size{};
  if (facts.isTerminal && ::ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 0) {
    facts.columns = size.ws_col;
  }
  facts.columnsVariable = variable("COLUMNS");
  facts.noColor = variable("NO_COLOR");
  facts.type = variable("TERM");
  return facts;
}

Terminal terminalOf(const TerminalFacts& facts, ColorChoice choice, bool quiet) {
  const auto asked = positiveNumber(facts.columnsVariable);
  ProgressPlace progress;
  progress.isTold = facts.hasComplaintsOnTerminal && facts.type != "dumb" && !quiet;
  ProgressPlace printing = progress;
  printing.isTold = progress.isTold && !facts.isTerminal;
  return {hasColor(facts, choice), quiet, asked ? asked : facts.columns, progress, printing};
}

std::string painted(std::string_view text, Paint paint, const Terminal& terminal) {
  if (!terminal.color || paint == Paint::Plain || text.empty()) return std::string(text);
  return std::string(codeOf(paint)).append(text).append("\x1b[0m");
}

std::size_t widthOf(std::string_view text) noexcept {
  return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), beginsCharacter));
}

std::string fitted(std::string_view text, std::size_t width) {
  if (widthOf(text) <= width) return std::string(text);
  if (width == 0) return {};
  std::size_t end = 0;
  for (std::size_t characters = 0; end < text.size(); ++end) {
    if (beginsCharacter(text[end]) && ++characters == width) break;
  }
  return std::string(text.substr(0, end)).append(kEllipsis);
}

}  // namespace tarn::ctl
