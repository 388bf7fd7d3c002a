// SPDX-License-Identifier: Apache-2.0
// Bars: numbers as lengths. Stateless. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "tools/report/Markup.h"
#include "tools/report/Picture.h"

namespace tarn::report {

struct Bar {
  std::string label;
  double value = 0;
  std::string text;             // of the value, beside the bar
  const char* kind = "output";  // a class of the style sheet
};

// One bar below the other, label at the left. All lengths are on one scale from 0 on.
void drawBars(Markup& markup, const PictureHead& head, const std::vector<Bar>& bars);
// One column beside the other; labels below as far as there is room. `unit` is told at the axis.
void drawColumns(Markup& markup, const PictureHead& head, const std::vector<Bar>& columns, const std::string& unit);

}  // namespace tarn::report
