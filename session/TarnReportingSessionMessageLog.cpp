#include "session/TarnReportingSessionMessageLog.h"

#include <utility>

namespace tarn {

namespace {

std::uint64_t keyOf(AudioEventCategory category, AudioEventType type) {
  return std::uint64_t{static_cast<std::uint32_t>(category)} << 16U | static_cast<std::uint16_t>(type);
}

}  // namespace

void TarnReportingSessionMessageLog::append(Record record) {
  // The place first: what points to the record must not outlive one that found no room.
  const auto [place, isNew] = newest_.try_emplace(keyOf(record->category(), record->type()));
  const std::size_t index = messages_.size();
  const TarnReportingSessionMessage* const recent = record.get();
  try {
    messages_.append(std::move(record));
  } catch (...) {
    if (isNew) {
      newest_.erase(place);
    }
    throw;
  }
  note(place->second, index, recent);
}

void TarnReportingSessionMessageLog::note(Newest& newest, std::size_t index,
                                          const TarnReportingSessionMessage* recent) noexcept {
  newest.index = index;
  newest.recent = recent;
  if (newest.kept) [[unlikely]] {
    newest.kept.reset();
    --kept_;
  }
}

void TarnReportingSessionMessageLog::sort() {
  if (!messages_.sort()) return;
  forgetKept();
  for (auto at = messages_.begin(); at != messages_.end(); ++at) {
    note(newest_[keyOf((*at)->category(), (*at)->type())], at.index(), at->get());
  }
}

void TarnReportingSessionMessageLog::clear() {
  messages_.clear();
  newest_.clear();
  looked_.reset();
  kept_ = 0;
}

const TarnReportingSessionMessage* TarnReportingSessionMessageLog::newest(AudioEventCategory category,
                                                                          AudioEventType type) const {
  const auto found = newest_.find(keyOf(category, type));
  if (found == newest_.end()) return nullptr;
  Newest& newest = found->second;
  if (newest.index >= messages_.overflowed()) return newest.recent;
  // A producer may have changed what was read back.
  if (changesSeen_ != messages_.changes()) {
    changesSeen_ = messages_.changes();
    forgetKept();
  }
  if (newest.kept) return newest.kept.get();
  looked_ = messages_[newest.index];
  if (kept_ < kMostKept && looked_) {
    newest.kept = looked_;
    ++kept_;
  }
  return looked_.get();
}

void TarnReportingSessionMessageLog::forgetKept() const {
  if (std::exchange(kept_, 0) == 0) return;
  for (auto& [key, newest] : newest_) {
    newest.kept.reset();
  }
}

}  // namespace tarn
