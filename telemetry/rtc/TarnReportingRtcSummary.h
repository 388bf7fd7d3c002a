// SPDX-License-Identifier: Apache-2.0
// TarnReportingRtcSummary: folds the messages of a session into one payload, the list of its values under each key.
//
//   {route = a; n = 1}, {n = 2}, {route = c}   becomes   {Tarn_Session_Summary_Event = 7; route = a,c; n = 1,2}
//
// Values of one key stand in message order; a key that is absent from some messages has fewer of them, so places are
// not aligned across keys.
//
// Threads: any.
#pragma once

#include <cstddef>
#include <memory>
#include <vector>

#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

struct TarnReportingRtcSummary {
  // A payload has its limits, and so does what takes it in: after so many bytes of keys and values no more messages
  // are added. On its way to the disk an event is in memory several times, and as JSON a byte may become six.
  static constexpr std::size_t kLongestText = std::size_t{16} << 20U;

  // "Tarn_Session_Summary_Event" is the number of the service type; every other value is the text of a list with
  // commas.
  plist::Dictionary payload;
  bool complete = true;  // false: the limit was reached
};

// Whether a logged message belongs into the summary: not when it is redundant, when it came while the session was not
// started, or when it is addressed to other workers. One without destinations is for everyone.
bool TarnReportingIsForRtcSummary(const TarnReportingSessionMessage& message);

// The messages of a session that was stopped: those of the pages, of which not all need belong into the summary, then
// the payloads of the others, which do. A page is read when its messages are added, one after the other.
struct TarnReportingRtcMessages {
  std::vector<std::shared_ptr<const TarnReportingSessionMessagePage>> pages;
  std::vector<plist::Dictionary> payloads;
};

// A page that can't be read back adds nothing. The limit is looked at between two messages, so the last one may exceed
// it. Linear in the values; the pages' messages are in memory one page at a time.
TarnReportingRtcSummary TarnReportingMakeRtcSummary(AudioServiceType serviceType,
                                                    const TarnReportingRtcMessages& stopped,
                                                    std::size_t longestText = TarnReportingRtcSummary::kLongestText);

}  // namespace tarn
