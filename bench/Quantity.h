// SPDX-License-Identifier: Apache-2.0
// Quantity: a measured number and how it is written; Beside: another with its name; Ratio: ours to theirs.
//
// They are put together as they are read: "bare " + microseconds(seconds), times(ratio) + " of 10^3".
#pragma once

#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::bench {

struct Quantity {
  std::string text;  // "7.52 us"; empty: there is none
  double value = std::numeric_limits<double>::quiet_NaN();
  std::string_view unit;  // of the value: "s", "1/s", "B", "threads"
};

struct Beside {
  std::string name;  // empty: there is none
  Quantity quantity;
  std::string remark;  // " (of two rows)"
};

struct Ratio {
  std::string text;  // "0.52 (0.49 to 0.57)"
  double value = std::numeric_limits<double>::quiet_NaN();
  // Over the rounds, where each round has one.
  struct Spread {
    double least, most;
  };
  std::optional<Spread> spread;
};

// Of times, given in seconds: "7.52 us", "797 ms"; of times given in nanoseconds: "412 ns".
Quantity microseconds(double seconds);
Quantity milliseconds(double seconds);
Quantity nanoseconds(double nanoseconds);
// "634 k/s", "12 /s", "187 B", "12.4 MB", "9 threads"
Quantity perSecond(double rate);
Quantity aSecond(double rate);
Quantity bytes(double count);
Quantity megabytes(double count);
Quantity counted(double count, std::string_view what);

Ratio times(double ratio);
// Ours to theirs of the same round: the median over the rounds, the least and the most. What disturbs the machine for
// longer than a round disturbs both and leaves their ratio. Both have a sample of each round.
Ratio timesOfRounds(const std::vector<double>& ours, const std::vector<double>& theirs);

// The name ends in the blank that parts it from the quantity.
Beside operator+(std::string name, Quantity quantity);
Beside operator+(Beside peer, std::string_view remark);
Ratio operator+(Ratio ratio, std::string_view remark);

}  // namespace tarn::bench
