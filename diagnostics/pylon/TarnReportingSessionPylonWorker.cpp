// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/TarnReportingSessionPylonWorker.h"

#include <string>

#include "diagnostics/pylon/AudioIssueDetected.h"
#include "diagnostics/pylon/TextFields.h"
#include "diagnostics/pylon/WireWriter.h"
#include "platform/Facilities.h"
#include "platform/PylonService.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

namespace {

using pylonmetrics::AudioIssueDetected;

constexpr TarnReportingLogger kLog{TarnReportingPylonLogCategory, "TarnReportingSessionPylonWorker"};
constexpr std::uint32_t kMetricIdentifier = 0x5B0003;

// The record as the metric service asks for it.
class PostedRecord final : public platform::MetricRecord {
 public:
  explicit PostedRecord(const AudioIssueDetected& record) noexcept : record_(record) {}
  std::string serialized() const override {
    pylonmetrics::WireWriter writer;
    record_.writeTo(writer);
    return writer.take();
  }
  plist::Dictionary textFields() const override {
    pylonmetrics::TextFields formatter;
    record_.formatText(formatter, "AudioIssueDetected");
    return formatter.fields();
  }

 private:
  const AudioIssueDetected& record_;
};

// The text form of a value as a C string holds it: up to the first NUL.
std::string cStringOf(const plist::ValueView& value) {
  std::string text = value.asText();
  text.resize(std::string_view(text).substr(0, text.find('\0')).size());
  return text;
}

std::int32_t lowBitsOf(const plist::ValueView& value) {
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(value.asInt64()));
}

// The value under the key; absent values are logged.
plist::ValueView valueOf(const plist::Dictionary& message, const plist::Key& key) {
  const plist::ValueView value = message.get(key);
  if (!value) {
    kLog(LogLevel::Error, "Failed to get %@ for AudioIssueDetected", key.text());
  }
  return value;
}

AudioIssueDetected recordOf(const plist::Dictionary& message) {
  static const plist::Key kIssueType("issue_type");
  static const plist::Key kRtaidClient("rtaid_client");
  static const plist::Key kNode("node");
  static const plist::Key kSilence("any_channel_silence_seconds");
  AudioIssueDetected record;
  if (const plist::ValueView value = valueOf(message, kIssueType)) {
    record.setIssuetype(cStringOf(value));
  }
  if (const plist::ValueView value = valueOf(message, kRtaidClient)) {
    record.setRtaidclient(cStringOf(value));
  }
  if (const plist::ValueView value = valueOf(message, kNode)) {
    record.setNode(cStringOf(value));
  }
  if (const plist::ValueView value = valueOf(message, kSilence)) {
    record.setDuration(lowBitsOf(value));
  }
  return record;
}

}  // namespace

std::unique_ptr<TarnReportingSessionPylonWorker> TarnReportingSessionPylonWorker::initWithSession(
    const std::shared_ptr<TarnReportingSession>& session) {
  return TarnReportingFacilities().pylon != nullptr ? std::make_unique<TarnReportingSessionPylonWorker>(session)
                                                    : nullptr;
}

void TarnReportingSessionPylonWorker::handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) {
  if (!message || message->type() != AudioEventType::IssueDetector) return;
  const AudioIssueDetected record = recordOf(message->message());
  TarnReportingFacilities().pylon->post(kMetricIdentifier, PostedRecord(record));
}

}  // namespace tarn
