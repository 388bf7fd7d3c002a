#include "session/TarnReportingSessionMessageLog.h"

namespace tarn {

namespace {

std::uint64_t keyOf(AudioEventCategory category, AudioEventType type) {
  return std::uint64_t{static_cast<std::uint32_t>(category)} << 16U | static_cast<std::uint16_t>(type);
}

}  // namespace

std::size_t TarnReportingSessionMessageLog::Hash::operator()(std::uint64_t key) const noexcept {
  key *= 0x9E3779B97F4A7C15U;
  return key ^ (key >> 32U);
}

void TarnReportingSessionMessageLog::append(Record record) {
  if (!newestIsStale_) {
    newest_[keyOf(record->category(), record->type())] = record.get();
  }
  messages_.push_back(std::move(record));
}

void TarnReportingSessionMessageLog::sort() {
  TarnReportingSessionMessage::sortMessages(messages_);
  newestIsStale_ = true;
}

void TarnReportingSessionMessageLog::clear() {
  messages_ = TarnReportingSessionMessages();  // gives the memory back too
  newest_.clear();
  newestIsStale_ = false;
}

const TarnReportingSessionMessage* TarnReportingSessionMessageLog::newest(AudioEventCategory category,
                                                                          AudioEventType type) const {
  if (newestIsStale_) {
    newest_.clear();
    for (const Record& record : messages_) {
      newest_[keyOf(record->category(), record->type())] = record.get();
    }
    newestIsStale_ = false;
  }
  const auto found = newest_.find(keyOf(category, type));
  return found == newest_.end() ? nullptr : found->second;
}

}  // namespace tarn
