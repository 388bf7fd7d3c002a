// SPDX-License-Identifier: Apache-2.0
// TopModel: what the live view shows, made of a look and the one before. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "tools/ctl/views/TopSample.h"

namespace tarn::ctl {

struct TopSession {
  OpenSession session;
  std::optional<double> rate;  // messages a second that were recorded; nothing at the first look
};

// A number of the service's dictionary. A counter by reasons counts as their sum.
struct TopNumber {
  std::string name;
  double value = 0;
  std::optional<double> rate;  // a second; nothing at the first look, for a level and after a new start of the service
};

struct TopView {
  TopSample sample;
  std::vector<TopNumber> levels;     // what is there now: sessions, connections, what waits
  std::vector<TopNumber> ledger;     // what was counted, in the service's order
  std::vector<TopSession> sessions;  // the busiest first, then the newest
};

TopView topView(const TopSample& now, const TopSample* before);

// Lines for people, at most `height` of them and none wider than `width` characters. Texts are as the clients sent
// them: the output makes them printable.
std::vector<std::string> topLines(const TopView& view, std::size_t width, std::size_t height);
// One JSON object without a line end: time, up, status (without quotas), rates, sessions. What isn't known is left out.
std::string topJson(const TopView& view);

}  // namespace tarn::ctl
