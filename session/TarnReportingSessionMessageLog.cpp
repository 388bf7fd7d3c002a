#include "session/TarnReportingSessionMessageLog.h"

namespace tarn {

void TarnReportingSessionMessageLog::append(Record record) {
  // The place first: what points to the record must not outlive one that found no room.
  const auto [place, isNew] = newest_.try_emplace(record->kind());
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
  try {
    if (!messages_.sort()) return;
  } catch (...) {  // for want of memory; records that are pointed to may be gone
    forgetPlaces();
    throw;
  }
  forgetPlaces();
  // What is still missing at the end lay in pages that are lost.
  std::size_t missing = newest_.size();
  const auto isMissing = [&](TarnReportingSessionMessage::Kind kind) { return newest_[kind].index == kNone; };
  messages_.goBack(isMissing, [&](std::size_t index, const Record& record) {
    Newest& newest = newest_[record->kind()];
    if (newest.index == kNone) {
      newest = {index, record.get(), nullptr};
      --missing;
    }
    return missing > 0;
  });
}

void TarnReportingSessionMessageLog::clear() {
  messages_.clear();
  newest_.clear();
  looked_.reset();
  kept_ = 0;
}

const TarnReportingSessionMessage* TarnReportingSessionMessageLog::newest(AudioEventCategory category,
                                                                          AudioEventType type) const {
  const auto found = newest_.find(TarnReportingSessionMessage::kindOf(category, type));
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
  if (looked_ && kept_ < kMostKept) {
    newest.kept = looked_;
    ++kept_;
  }
  return looked_.get();
}

// The kinds stay: each that the log has is known.
void TarnReportingSessionMessageLog::forgetPlaces() noexcept {
  for (auto& [kind, newest] : newest_) {
    newest = {};
  }
  kept_ = 0;
}

void TarnReportingSessionMessageLog::forgetKept() const {
  for (auto& [key, newest] : newest_) {
    newest.kept.reset();
  }
  kept_ = 0;
}

}  // namespace tarn
