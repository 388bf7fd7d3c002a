// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/pylon/AudioIssueDetected.h"

#include "diagnostics/pylon/CityHash64.h"
#include "diagnostics/pylon/TextFormatter.h"
#include "diagnostics/pylon/WireReader.h"
#include "diagnostics/pylon/WireWriter.h"

namespace pylonmetrics {

namespace {

// Field numbers, and with them the order on the wire.
constexpr std::uint32_t kTimestamp = 1;
constexpr std::uint32_t kDuration = 2;
constexpr std::uint32_t kIssuetype = 3;
constexpr std::uint32_t kNode = 4;
constexpr std::uint32_t kRtaidclient = 5;

}  // namespace

AudioIssueDetected::AudioIssueDetected(const AudioIssueDetected& other)
    : MetricMessage(other),
      issuetype_(other.issuetype_),
      node_(other.node_),
      rtaidclient_(other.rtaidclient_),
      duration_(other.duration_) {
  if (other.hasTimestamp()) {
    setTimestamp(other.timestamp_);
  }
}

AudioIssueDetected::AudioIssueDetected(AudioIssueDetected&& other) noexcept
    : issuetype_(std::exchange(other.issuetype_, {})),
      node_(std::exchange(other.node_, {})),
      rtaidclient_(std::exchange(other.rtaidclient_, {})),
      timestamp_(other.timestamp_),
      duration_(other.duration_),
      has_(std::exchange(other.has_, 0)) {}

AudioIssueDetected& AudioIssueDetected::operator=(const AudioIssueDetected& other) {
  if (this != &other) {
    AudioIssueDetected copy(other);
    swap(*this, copy);
  }
  return *this;
}

AudioIssueDetected& AudioIssueDetected::operator=(AudioIssueDetected&& other) noexcept {
  AudioIssueDetected taken(std::move(other));  // a record moved to itself comes back from here
  swap(*this, taken);
  return *this;
}

void AudioIssueDetected::setTimestamp(std::uint64_t timestamp) noexcept {
  has_ |= kHasTimestamp;
  timestamp_ = timestamp;
}

void AudioIssueDetected::readField(WireReader& reader, std::uint64_t number) {
  switch (number) {
    case kTimestamp:
      setTimestamp(reader.readVarint());
      break;
    case kDuration:
      duration_ = static_cast<std::int32_t>(static_cast<std::uint32_t>(reader.readVarint()));
      break;
    case kIssuetype:
      reader.readString(issuetype_);
      break;
    case kNode:
      reader.readString(node_);
      break;
    default:
      reader.readString(rtaidclient_);
      break;
  }
}

bool AudioIssueDetected::readFrom(WireReader& reader) {
  if (reader.atEnd()) return true;
  while (!reader.atEnd() && !reader.failed()) {
    const std::uint64_t tag = reader.readVarint();
    const auto type = static_cast<unsigned>(tag & kWireTypeMask);
    if (reader.failed() || type == static_cast<unsigned>(WireType::GroupEnd)) break;
    const std::uint64_t number = tag >> kWireTypeBits;
    if (number >= kTimestamp && number <= kRtaidclient) {
      readField(reader, number);
    } else if (!reader.skip(number, type)) {
      return false;
    }
  }
  return !reader.failed();
}

void AudioIssueDetected::writeTo(WireWriter& writer) const {
  if (hasTimestamp()) {
    writer.writeUnsigned(kTimestamp, timestamp_);
  }
  writer.writeSigned(kDuration, duration_);
  writer.writeString(kIssuetype, issuetype_);
  writer.writeString(kNode, node_);
  writer.writeString(kRtaidclient, rtaidclient_);
}

void AudioIssueDetected::formatText(TextFormatter& formatter, std::string_view name) const {
  formatter.beginObject(name);
  formatter.formatSigned("duration", duration_);
  formatter.formatString("issuetype", issuetype_);
  formatter.formatString("node", node_);
  formatter.formatString("rtaidclient", rtaidclient_);
  if (hasTimestamp()) {
    formatter.formatUnsigned("timestamp", timestamp_);
  }
  formatter.endObject();
}

std::uint64_t AudioIssueDetected::hash_value() const noexcept {
  // The duration widens with zeros, a negative one too.
  return timestamp() ^ static_cast<std::uint32_t>(duration_) ^ cityHash64(issuetype_) ^ cityHash64(node_) ^
         cityHash64(rtaidclient_);
}

bool operator==(const AudioIssueDetected& a, const AudioIssueDetected& b) noexcept {
  return a.hasTimestamp() == b.hasTimestamp() && a.timestamp() == b.timestamp() && a.duration_ == b.duration_ &&
         a.issuetype_ == b.issuetype_ && a.node_ == b.node_ && a.rtaidclient_ == b.rtaidclient_;
}

void swap(AudioIssueDetected& a, AudioIssueDetected& b) noexcept {
  std::swap(a.has_, b.has_);
  std::swap(a.timestamp_, b.timestamp_);
  std::swap(a.duration_, b.duration_);
  a.issuetype_.swap(b.issuetype_);
  a.node_.swap(b.node_);
  a.rtaidclient_.swap(b.rtaidclient_);
}

}  // namespace pylonmetrics
