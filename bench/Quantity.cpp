// SPDX-License-Identifier: Apache-2.0
#include "bench/Quantity.h"

#include <algorithm>
#include <cstdio>
#include <functional>
#include <iterator>
#include <utility>

#include "bench/Measure.h"

namespace tarn::bench {

namespace {

std::string withUnit(double value, const char* unit) {
  char text[48];
  const int decimals = value >= 100 ? 0 : value >= 10 ? 1 : 2;
  std::snprintf(text, sizeof text, "%.*f%s", decimals, value, unit);
  return text;
}

}  // namespace

Quantity microseconds(double seconds) {
  return {withUnit(seconds * 1e6, " us"), seconds, "s"};
}

Quantity milliseconds(double seconds) {
  return {withUnit(seconds * 1e3, " ms"), seconds, "s"};
}

Quantity nanoseconds(double nanoseconds) {
  return {withUnit(nanoseconds, " ns"), nanoseconds / 1e9, "s"};
}

Quantity perSecond(double rate) {
  return {withUnit(rate / 1e3, " k/s"), rate, "1/s"};
}

Quantity aSecond(double rate) {
  return {withUnit(rate, " /s"), rate, "1/s"};
}

Quantity bytes(double count) {
  return {withUnit(count, " B"), count, "B"};
}

Quantity megabytes(double count) {
  return {withUnit(count / 1e6, " MB"), count, "B"};
}

Quantity counted(double count, std::string_view what) {
  return {std::to_string(static_cast<int>(count + 0.5)) + " " + std::string(what), count, what};
}

Ratio times(double ratio) {
  char text[32];
  std::snprintf(text, sizeof text, "%.2f", ratio);
  return {text, ratio, {}};
}

Ratio timesOfRounds(const std::vector<double>& ours, const std::vector<double>& theirs) {
  Samples ratios;
  std::transform(ours.begin(), ours.end(), theirs.begin(), std::back_inserter(ratios), std::divides<>());
  const auto [least, most] = std::minmax_element(ratios.begin(), ratios.end());
  Ratio all = times(median(ratios)) + (" (" + times(*least).text + " to " + times(*most).text + ")");
  all.spread = {*least, *most};
  return all;
}

Beside operator+(std::string name, Quantity quantity) {
  name.erase(name.find_last_not_of(' ') + 1);
  return {std::move(name), std::move(quantity), {}};
}

Beside operator+(Beside peer, std::string_view remark) {
  peer.remark += remark;
  return peer;
}

Ratio operator+(Ratio ratio, std::string_view remark) {
  ratio.text += remark;
  return ratio;
}

}  // namespace tarn::bench
