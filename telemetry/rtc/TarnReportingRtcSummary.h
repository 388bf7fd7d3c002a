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
#include <deque>
#include <memory>
#include <vector>

#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingVocabulary.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

struct TarnReportingRtcSummary {
  // A payload has its limits, and so does what takes it in: after so many bytes of keys and values no more messages
  // are added. As JSON a byte may become six, and what stands in for the service takes no text of a gigabyte.
  static constexpr std::size_t kLongestText = std::size_t{128} << 20U;

  // "Tarn_Session_Summary_Event" is the number of the service type; every other value is the text of a list with
  // commas.
  plist::Dictionary payload;
  bool complete = true;  // false: the limit was reached
};

// Whether the Rtc worker is among those that the message is for. One without destinations is for everyone.
bool TarnReportingIsAddressedToRtc(const TarnReportingSessionMessage& message);

// The messages of a session that was stopped: those of the pages, of which not all need be for the worker, then the
// others, which are. A page is read when its messages are added, one after the other. The others lie here by value: the
// copies are made while the session stops, and let go of on another thread.
struct TarnReportingRtcMessages {
  std::vector<std::shared_ptr<const TarnReportingSessionMessagePage>> pages;
  std::deque<TarnReportingSessionMessage> messages;
};

// Redundant messages and those that came while the session was not started are left out. A page that can't be read back
// adds nothing. The limit is looked at between two messages, so the last one may exceed it. Linear in the values; the
// pages' messages are in memory one page at a time.
TarnReportingRtcSummary TarnReportingMakeRtcSummary(AudioServiceType serviceType,
                                                    const TarnReportingRtcMessages& stopped,
                                                    std::size_t longestText = TarnReportingRtcSummary::kLongestText);

}  // namespace tarn
