// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/CopyRows.h"

#include <cmath>

#include "fleet/collect/CleanText.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kHead{"PGCOPY\n\xff\r\n\0\0\0\0\0\0\0\0\0", 19};
constexpr std::string_view kEnd{"\xff\xff", 2};
constexpr std::int64_t kLastTime = 4'102'444'799;     // the last second of 2099
constexpr std::int64_t kDatabaseEpoch = 946'684'800;  // 2000-01-01
constexpr std::int64_t kMicroseconds = 1'000'000;
constexpr char kJsonVersion = 1;

// The highest byte first.
template <class Number>
void append(std::string& out, Number value) {
  for (int shift = 8 * (static_cast<int>(sizeof value) - 1); shift >= 0; shift -= 8) {
    out += static_cast<char>((static_cast<std::uint64_t>(value) >> static_cast<unsigned>(shift)) & 0xFFU);
  }
}

}  // namespace

std::int64_t microsecondsOf(double time) noexcept {
  if (!(time > 0)) return 0;
  if (time > static_cast<double>(kLastTime)) return kLastTime * kMicroseconds;
  return std::llround(time * static_cast<double>(kMicroseconds));
}

CopyRows::CopyRows() : bytes_(kHead) {}

void CopyRows::length(std::size_t bytes) {
  append(bytes_, static_cast<std::int32_t>(bytes));
}

void CopyRows::begin(std::int16_t fields) {
  append(bytes_, fields);
  ++rows_;
}

void CopyRows::null() {
  append(bytes_, std::int32_t{-1});
}

void CopyRows::small(std::int16_t value) {
  length(sizeof value);
  append(bytes_, value);
}

void CopyRows::integer(std::int32_t value) {
  length(sizeof value);
  append(bytes_, value);
}

void CopyRows::number(std::int64_t value) {
  length(sizeof value);
  append(bytes_, value);
}

void CopyRows::text(std::string_view value) {
  const std::string_view clean = cleanText(value, clean_);
  length(clean.size());
  bytes_ += clean;
}

void CopyRows::json(std::string_view value) {
  const std::string_view clean = cleanJson(value, clean_);
  length(clean.size() + 1);
  bytes_ += kJsonVersion;
  bytes_ += clean;
}

void CopyRows::time(double seconds) {
  number(microsecondsOf(seconds) - kDatabaseEpoch * kMicroseconds);
}

void CopyRows::timeOrNull(bool isThere, double seconds) {
  if (isThere) {
    time(seconds);
  } else {
    null();
  }
}

const std::string& CopyRows::finish() {
  bytes_ += kEnd;
  return bytes_;
}

}  // namespace tarn::fleet
