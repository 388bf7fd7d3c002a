// SPDX-License-Identifier: Apache-2.0
// What clients send to a session whose stop is measured: an ordinary mixture, and two that only wear the stop out.
// Messages of a stream are all different, so that each is logged.
//
// Threads: any.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "session/TarnReportingSessionMessage.h"

namespace tarn::bench {

enum class Stream {
  // Songs of 200 messages, four a second: states of the output with volume, route and format, every tenth message one
  // of the input, every twentieth one of the group session, two of the spatial settings. Of a song come five volume
  // messages, one of the input and one or two of the group. Every fiftieth stamp is out of order.
  Ordinary,
  // Pairs of spatial settings within the pause of combining: each message heads a burst or is merged into its head.
  MergingPairs,
  // Output runs, and every second message changes the volume, which ends a segment.
  EndingSegments,
};

// Message number `number` of the stream, stamped `startSeconds` (epoch) and what the messages before it take.
std::shared_ptr<TarnReportingSessionMessage> makeStreamMessage(Stream stream, std::uint64_t number,
                                                               double startSeconds);

}  // namespace tarn::bench
