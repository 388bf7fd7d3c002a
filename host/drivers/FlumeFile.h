// SPDX-License-Identifier: Apache-2.0
// parseFlumeFile: the text of one driver's file of report channels.
//
//   {"driver": "OxbowFoo<0x12>", "group": "Haptics", "subgroup": "Stats", "channels": [
//     {"name": "Engine On", "format": "simple", "unit": "times", "value": 12},
//     {"name": "Latency", "format": "histogram", "unit": "us", "min": 0, "max": 90, "buckets": [[0, 50, 3], [50, 100,
//     1]]},
//     {"name": "Engine", "format": "state", "unit": "ms",
//      "states": [{"name": "on", "transitions": 3, "residency": 1500, "duty_cycle": 0.1}]}]}
//
// "group", "subgroup" and "unit" may be missing, and other members may be there; a null is as good as missing. Numbers
// are whole ones (5.0 is), except the duty cycle; hits, transitions and residencies are not below 0. The "value" of a
// simple array is not looked at.
//
// A text that is not one whole object of this form holds no channel. A channel that is wrong in itself is left out, and
// so is one of a name that an earlier one has, and what is beyond the bounds. Threads: any. Nothing is thrown.
#pragma once

#include <cstddef>
#include <string_view>

#include "platform/FlumeService.h"
#include "plist/Result.h"

namespace tarn::linux_host {

struct FlumeFileBounds {
  std::size_t channels = 1024;  // of a file; those beyond are left out
  std::size_t buckets = 1024;   // of a histogram; one with more is wrong
  std::size_t states = 256;     // of a state channel; one with more is wrong
};

// The channels in the file's order, no two known alike. An error tells the first thing that is wrong, and how many more
// there are; the channels that are right stand beside it.
Result<platform::FlumeSamples> parseFlumeFile(std::string_view text, const FlumeFileBounds& bounds = {});

}  // namespace tarn::linux_host
