#include "session/TarnReportingSessionMessageLog.h"

namespace tarn {

namespace {

std::uint64_t keyOf(AudioEventCategory category, AudioEventType type) {
  return std::uint64_t{static_cast<std::uint32_t>(category)} << 16U | static_cast<std::uint16_t>(type);
}

}  // namespace

void TarnReportingSessionMessageLog::append(Record record) {
  Newest& newest = newest_[keyOf(record->category(), record->type())];
  const std::size_t index = messages_.size();
  const TarnReportingSessionMessage* const recent = record.get();
  messages_.append(std::move(record));
  note(newest, index, recent);
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
  newest_.clear();  // of kinds of which nothing can be read back, nothing is left
  kept_ = 0;
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
  if (looked_ && kept_ < kMostKept) {
    newest.kept = looked_;
    ++kept_;
  }
  return looked_.get();
}

void TarnReportingSessionMessageLog::forgetKept() const {
  for (auto& [key, newest] : newest_) {
    newest.kept.reset();
  }
  kept_ = 0;
}

}  // namespace tarn
