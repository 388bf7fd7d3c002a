// SPDX-License-Identifier: Apache-2.0
// What PipeWire packs into PODs, unpacked: volumes, formats, routes, the profiler's cycles.
//
// A POD that isn't what it should be gives nothing; nothing is read beyond its size. Threads: any.
#pragma once

#include <optional>
#include <vector>

#include "adapters/pipewire/core/GraphFacts.h"

struct spa_pod;

namespace tarn::streams {

struct RouteFacts {
  bool isOutput = true;
  std::int32_t device = 0;  // what a node calls card.profile.device
  PortFacts port;
};

std::optional<VolumeFacts> volumesOf(const spa_pod* props);
// Nothing also for a format of something else than audio.
std::optional<FormatFacts> formatOf(const spa_pod* format);
std::optional<RouteFacts> routeOf(const spa_pod* route);
// The cycles of an event of the profiler. `since` is when PipeWire's clock stood at 0.
std::vector<CycleFacts> cyclesOf(const spa_pod* profile, Moment since);

}  // namespace tarn::streams
