#include "session/TarnReportingSessionMessageLog.h"

namespace tarn {

namespace {

std::uint64_t keyOf(AudioEventCategory category, AudioEventType type) {
  return std::uint64_t{static_cast<std::uint32_t>(category)} << 16U | static_cast<std::uint16_t>(type);
}

}  // namespace

void TarnReportingSessionMessageLog::append(Record record) {
  // The place first: what points to the record must not outlive one that found no room.
  const TarnReportingSessionMessage*& newest = newest_[keyOf(record->category(), record->type())];
  messages_.push_back(std::move(record));
  newest = messages_.back().get();
}

void TarnReportingSessionMessageLog::sort() {
  TarnReportingSessionMessage::sortMessages(messages_);
  for (const Record& record : messages_) {
    newest_[keyOf(record->category(), record->type())] = record.get();
  }
}

void TarnReportingSessionMessageLog::clear() {
  messages_ = TarnReportingSessionMessages();  // gives the memory back too
  newest_.clear();
}

const TarnReportingSessionMessage* TarnReportingSessionMessageLog::newest(AudioEventCategory category,
                                                                          AudioEventType type) const {
  const auto found = newest_.find(keyOf(category, type));
  return found == newest_.end() ? nullptr : found->second;
}

}  // namespace tarn
