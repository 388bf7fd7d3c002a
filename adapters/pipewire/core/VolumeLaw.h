// SPDX-License-Identifier: Apache-2.0
// How loud a node is, in the two scales that people meet.
//
// PipeWire keeps factors of the amplitude: 0.125 makes each sample an eighth. Mixers show the cube root of it, since
// that is closer to what is heard: the slider of that node stands at 50 %. Reports carry both.
#pragma once

#include <string>

#include "adapters/pipewire/core/GraphFacts.h"

namespace tarn::streams {

// The factor of the loudest channel, with the node's own volume; whether it is muted doesn't count.
double linearVolume(const VolumeFacts& volumes);
// Where a slider stands for that factor: its cube root, to four decimals, at most 1.
double sliderVolume(double linear);
bool isMuted(const VolumeFacts& volumes);
// The factors of all channels with commas: 0.125,0.25. Empty when the node has no channels yet.
std::string channelVolumesText(const VolumeFacts& volumes);
// A factor in as few digits as tell it from all others of its size.
std::string factorText(float factor);

}  // namespace tarn::streams
