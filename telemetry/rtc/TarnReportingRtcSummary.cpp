// SPDX-License-Identifier: Apache-2.0
#include "telemetry/rtc/TarnReportingRtcSummary.h"

#include <algorithm>
#include <deque>
#include <string>
#include <string_view>
#include <unordered_map>

namespace tarn {

namespace {

const plist::Key kSummaryEvent("Tarn_Session_Summary_Event");
constexpr std::string_view kWorker = "TarnReportingSessionRtcWorker";

// The joined values of each key, keys in the order in which they were first seen.
class Table {
 public:
  void append(const plist::Key& key, const plist::ValueView& value) {
    const auto [place, isNew] = places_.try_emplace(key, lists_.size());
    if (isNew) {
      lists_.push_back({key, {}});
      bytes_ += key.text().size();
    }
    std::string& text = lists_[place->second].text;
    const std::size_t before = text.size();
    if (!isNew) {
      text += ',';
    }
    plist::appendDescription(text, value);
    bytes_ += text.size() - before;
  }
  // Of all keys and values.
  std::size_t bytes() const noexcept { return bytes_; }
  plist::Dictionary payload() const {
    std::vector<plist::Dictionary::Entry> entries;
    entries.reserve(lists_.size());
    for (const List& list : lists_) {
      entries.push_back({list.key, list.text});
    }
    return plist::Dictionary::fromEntries(entries);
  }

 private:
  struct List {
    plist::Key key;
    std::string text;
  };
  std::unordered_map<plist::Key, std::size_t> places_;
  std::deque<List> lists_;
  std::size_t bytes_ = 0;
};

}  // namespace

bool TarnReportingIsForRtcSummary(const TarnReportingSessionMessage& message) {
  if (message.isRedundant() || !message.isSessionStarted()) return false;
  const auto& destinations = message.destinationWorkers();
  return destinations.empty() || std::find(destinations.begin(), destinations.end(), kWorker) != destinations.end();
}

TarnReportingRtcSummary TarnReportingMakeRtcSummary(AudioServiceType serviceType,
                                                    const TarnReportingRtcMessages& stopped, std::size_t longestText) {
  TarnReportingRtcSummary summary;
  Table table;
  table.append(kSummaryEvent, static_cast<unsigned>(serviceType));
  const auto take = [&](const plist::Dictionary& payload) {
    summary.complete = summary.complete && table.bytes() < longestText;
    if (!summary.complete) return;
    for (const plist::Dictionary::Entry& entry : payload) {
      table.append(entry.key, entry.value);
    }
  };
  for (const auto& page : stopped.pages) {
    if (!summary.complete) break;
    for (const auto& message : page->read()) {
      if (TarnReportingIsForRtcSummary(*message)) {
        take(message->message());
      }
    }
  }
  std::for_each(stopped.payloads.begin(), stopped.payloads.end(), take);
  summary.payload = table.payload();
  return summary;
}

}  // namespace tarn
