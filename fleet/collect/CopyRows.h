// SPDX-License-Identifier: Apache-2.0
// CopyRows: rows as the database's COPY takes them in binary: nothing is escaped, so nothing can be taken for something
// else.
//
//   rows.begin(2); rows.number(7); rows.text("seven");  ...  rows.finish()
//
// Threads: one.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tarn::fleet {

// Microseconds since 1970 of a time in seconds. What isn't a number, lies before 1970 or after 2099 becomes the nearest
// of what can be: a device's clock may say anything, and a day that the database has no name for would keep all out.
std::int64_t microsecondsOf(double time) noexcept;

class CopyRows {
 public:
  CopyRows();

  void begin(std::int16_t fields);
  void null();
  void small(std::int16_t value);
  void integer(std::int32_t value);
  void number(std::int64_t value);
  // Of text, with what the database doesn't take replaced.
  void text(std::string_view value);
  // Of a JSON document.
  void json(std::string_view value);
  // A time in seconds since 1970.
  void time(double seconds);
  void timeOrNull(bool isThere, double seconds);

  int rows() const noexcept { return rows_; }
  // All of them; nothing is added after that.
  const std::string& finish();

 private:
  void length(std::size_t bytes);

  std::string bytes_;
  std::string clean_;
  int rows_ = 0;
};

}  // namespace tarn::fleet
