// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Bars.h"

#include <algorithm>
#include <cmath>

#include "tools/report/Scale.h"
#include "tools/report/Texts.h"

namespace tarn::report {

namespace {

constexpr double kRow = 22;
constexpr double kBarHeight = 14;
constexpr double kLabelRoom = 300;  // at the left of bars
constexpr double kValueRoom = 200;  // at their right: "12345 overloads, 12345 errors"
constexpr std::size_t kLabelCharacters = 38;
constexpr double kAxisRoom = 60;  // at the left of columns
constexpr double kPlotTop = 24;
constexpr double kPlotHeight = 140;
constexpr double kBelow = 24;
constexpr int kTicks = 4;
constexpr double kWidestColumn = 48;
constexpr double kLabelWidth = 84;  // of one label below a column

double highestOf(const std::vector<Bar>& bars) {
  double highest = 0;
  for (const Bar& bar : bars) {
    highest = std::max(highest, bar.value);
  }
  return highest;
}

}  // namespace

void drawBars(Markup& markup, const PictureHead& head, const std::vector<Bar>& bars) {
  Picture picture(markup, head, kRow * static_cast<double>(bars.size()) + 8);
  const double highest = highestOf(bars);
  const Scale scale{0, highest, kLabelRoom, kPictureWidth - kLabelRoom - kValueRoom};
  double y = 4;
  for (const Bar& bar : bars) {
    picture.text("end", kLabelRoom - 8, y + kBarHeight - 2, shortened(bar.label, kLabelCharacters));
    const double width = scale.at(bar.value) - kLabelRoom;
    picture.box(bar.kind, kLabelRoom, y, width, kBarHeight);
    picture.text("start", kLabelRoom + width + 6, y + kBarHeight - 2, bar.text);
    y += kRow;
  }
}

void drawColumns(Markup& markup, const PictureHead& head, const std::vector<Bar>& columns, const std::string& unit) {
  constexpr double kBottom = kPlotTop + kPlotHeight;
  Picture picture(markup, head, kBottom + kBelow);
  const std::vector<Tick> ticks = valueTicks(highestOf(columns), kTicks);
  const Scale scale{0, ticks.back().value, 0, kPlotHeight};
  picture.text("start", 4, 12, unit);
  for (const Tick& tick : ticks) {
    const double y = kBottom - scale.at(tick.value);
    picture.line("grid", kAxisRoom, y, kPictureWidth, y);
    picture.text("end", kAxisRoom - 6, y + 4, tick.text);
  }
  if (columns.empty()) return;
  const double room = (kPictureWidth - kAxisRoom) / static_cast<double>(columns.size());
  const double width = std::min(kWidestColumn, room * 0.8);
  const auto every = static_cast<std::size_t>(std::ceil(kLabelWidth / room));
  double middle = kAxisRoom + room / 2;
  for (std::size_t index = 0; index < columns.size(); ++index, middle += room) {
    const double height = scale.at(columns[index].value);
    picture.box(columns[index].kind, middle - width / 2, kBottom - height, width, height);
    if (index % every == 0) {
      picture.text("middle", middle, kBottom + 16, columns[index].label);
    }
  }
}

}  // namespace tarn::report
