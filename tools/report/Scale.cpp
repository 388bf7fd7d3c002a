// SPDX-License-Identifier: Apache-2.0
#include "tools/report/Scale.h"

#include <algorithm>
#include <cmath>

#include "tools/report/Texts.h"

namespace tarn::report {

namespace {

constexpr double kDay = 86400;

double roundStep(double least) {
  const double power = std::pow(10.0, std::floor(std::log10(least)));
  for (const double factor : {1.0, 2.0, 5.0}) {
    if (factor * power >= least * (1 - 1e-9)) return factor * power;
  }
  return 10 * power;
}

double timeStep(double least) {
  if (least < 1) return std::max(0.001, roundStep(least));
  for (const double step : {1.0,   2.0,    5.0,    10.0,   15.0,    30.0,    60.0,    120.0, 300.0,    600.0,
                            900.0, 1800.0, 3600.0, 7200.0, 10800.0, 21600.0, 43200.0, kDay,  2 * kDay, 7 * kDay}) {
    if (step >= least) return step;
  }
  return std::ceil(least / (7 * kDay)) * 7 * kDay;
}

// As much of a moment as tells it from its neighbours.
std::string momentText(double moment, double step) {
  if (step >= kDay) return dayText(moment);
  constexpr std::size_t kTimeOfDay = 11;  // where it begins in the text
  const std::string text = step < 1 ? preciseTimeText(moment) : timeText(moment);
  if (text.size() <= kTimeOfDay) return text;
  return step < 60 ? text.substr(kTimeOfDay) : text.substr(kTimeOfDay, 5);
}

}  // namespace

double Scale::at(double value) const noexcept {
  if (!(to > from)) return left;
  return left + std::clamp((value - from) / (to - from), 0.0, 1.0) * width;
}

std::vector<Tick> valueTicks(double highest, int most) {
  std::vector<Tick> ticks;
  const double step = highest > 0 && std::isfinite(highest) ? roundStep(highest / most) : 1;
  for (int count = 0; count <= most; ++count) {
    ticks.push_back({step * count, numberText(step * count)});
    if (count > 0 && step * count >= highest * (1 - 1e-9)) break;
  }
  return ticks;
}

std::vector<Tick> timeTicks(double from, double to, int most) {
  std::vector<Tick> ticks;
  if (!(to > from) || !std::isfinite(to - from)) return ticks;
  const double step = timeStep((to - from) / most);
  for (double moment = std::ceil(from / step) * step; moment <= to && ticks.size() <= static_cast<std::size_t>(most);
       moment += step) {
    ticks.push_back({moment, momentText(moment, step)});
  }
  return ticks;
}

std::string placeText(double place) {
  return numberText(std::round(place * 100) / 100);
}

}  // namespace tarn::report
