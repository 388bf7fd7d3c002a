// SPDX-License-Identifier: Apache-2.0
#include "fleet/cursor/CursorFile.h"

#include <sodium.h>

#include <array>
#include <bit>
#include <cerrno>
#include <charconv>
#include <optional>
#include <string_view>

#include "host/system/FileReplacement.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kHead = "tarnreporting-export 1";
constexpr std::size_t kMostBytes = std::size_t{1} << 20U;
constexpr std::size_t kHashBytes = 16;
constexpr char kNothing = '-';

std::string hashOf(std::string_view text) {
  std::array<unsigned char, kHashBytes> hash{};
  crypto_generichash(hash.data(), hash.size(), reinterpret_cast<const unsigned char*>(text.data()), text.size(),
                     nullptr, 0);
  std::string digits;
  plist::appendHex(digits, std::string_view(reinterpret_cast<const char*>(hash.data()), hash.size()));
  return digits;
}

std::string lineOf(const Cursor& cursor) {
  std::string line(kHead);
  for (const std::int64_t number :
       {cursor.event, cursor.lookedAt, cursor.mark.run, std::bit_cast<std::int64_t>(cursor.mark.started)}) {
    line += ' ' + std::to_string(number);
  }
  line += ' ';
  line += kNothing;
  plist::appendHex(line, std::string_view(cursor.mark.boot));
  line += ' ';
  line += kNothing;
  for (const std::int64_t session : cursor.open) {
    line += std::to_string(session) + ',';
  }
  return line + ' ' + hashOf(line);
}

std::string_view takeWord(std::string_view& text) {
  const std::string_view word = text.substr(0, text.find(' '));
  text.remove_prefix(std::min(text.size(), word.size() + 1));
  return word;
}

bool takeNumber(std::string_view& text, std::int64_t& number) {
  const std::string_view word = takeWord(text);
  const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
  return error == std::errc() && end == word.data() + word.size();
}

bool readBoot(std::string_view digits, std::string& boot) {
  for (; digits.size() >= 2; digits.remove_prefix(2)) {
    unsigned byte = 0;
    const auto [end, error] = std::from_chars(digits.data(), digits.data() + 2, byte, 16);
    if (error != std::errc() || end != digits.data() + 2) return false;
    boot += static_cast<char>(byte);
  }
  return digits.empty();
}

bool readOpen(std::string_view list, std::vector<std::int64_t>& open) {
  while (!list.empty()) {
    const std::size_t comma = list.find(',');
    if (comma == std::string_view::npos) return false;
    std::string_view number = list.substr(0, comma);
    if (!takeNumber(number, open.emplace_back())) return false;
    list.remove_prefix(comma + 1);
  }
  return true;
}

std::optional<Cursor> cursorOf(std::string_view line) {
  const std::size_t hash = line.rfind(' ');
  if (hash == std::string_view::npos || hashOf(line.substr(0, hash)) != line.substr(hash + 1)) return std::nullopt;
  std::string_view rest = line.substr(0, hash);
  if (rest.substr(0, kHead.size() + 1) != std::string(kHead) + " ") return std::nullopt;
  rest.remove_prefix(kHead.size() + 1);
  Cursor cursor;
  std::int64_t started = 0;
  const bool hasNumbers = takeNumber(rest, cursor.event) && takeNumber(rest, cursor.lookedAt) &&
                          takeNumber(rest, cursor.mark.run) && takeNumber(rest, started);
  cursor.mark.started = std::bit_cast<double>(started);
  const std::string_view boot = takeWord(rest);
  const std::string_view open = takeWord(rest);
  const bool isWhole = hasNumbers && !boot.empty() && !open.empty() && readBoot(boot.substr(1), cursor.mark.boot) &&
                       readOpen(open.substr(1), cursor.open);
  return isWhole ? std::optional(cursor) : std::nullopt;
}

}  // namespace

Result<ReadCursor> CursorFile::read() {
  const Result<std::string> text = linux_host::readSmallFile(path_, kMostBytes);
  if (text.error.code() == ENOENT) return {};
  if (text.failed()) return {{}, linux_host::errorOf(path_, *text.error)};
  Result<ReadCursor> read;
  std::string_view rest = text.value;
  for (int place = 0; !rest.empty(); ++place) {
    const std::string_view line = rest.substr(0, rest.find('\n'));
    rest.remove_prefix(std::min(rest.size(), line.size() + 1));
    if (const std::optional<Cursor> cursor = cursorOf(line)) {
      newest_ = line;
      read.value.cursor = *cursor;
      read.value.remark = place == 0 ? "" : path_ + ": damaged; going on from the state before";
      return read;
    }
  }
  read.value.remark = path_ + ": damaged; going on from the beginning of the store";
  return read;
}

Status CursorFile::write(const Cursor& cursor) {
  std::string line = lineOf(cursor);
  std::string content = line + '\n';
  if (!newest_.empty()) {
    content += newest_ + '\n';
  }
  Status written = linux_host::replaceFile(path_, path_ + ".new", content);
  if (written.failed()) return linux_host::errorOf(path_, *written);
  newest_ = std::move(line);
  return {};
}

}  // namespace tarn::fleet
