// SPDX-License-Identifier: Apache-2.0
// Scale: brings values onto an axis of a picture and chooses where the axis has marks. Stateless. Threads: any.
#pragma once

#include <string>
#include <vector>

namespace tarn::report {

// From a stretch of values to a stretch of a picture; values outside are held to its ends.
struct Scale {
  double from = 0;
  double to = 1;
  double left = 0;  // where `from` lies
  double width = 1;

  double at(double value) const noexcept;
};

// A mark of an axis.
struct Tick {
  double value = 0;
  std::string text;
};

// At most `most` + 1 round values from 0 up to the first one that isn't below `highest`: 0, 5, 10. For no highest value
// 0 and 1.
std::vector<Tick> valueTicks(double highest, int most);
// Round moments in the stretch, at most `most` + 1 of them, as times of the day; days where they are whole days.
std::vector<Tick> timeTicks(double from, double to, int most);

// A place in a picture: at most two decimals.
std::string placeText(double place);

}  // namespace tarn::report
