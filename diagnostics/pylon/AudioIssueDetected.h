// SPDX-License-Identifier: Apache-2.0
// AudioIssueDetected: the metric record of one detected audio issue: what kind, on which node, for which
// real-time-audio client, how long, and when.
//
// On the wire (see WireFormat.h), in this order:
//
//   08 varint           timestamp, only when it was set
//   10 varint           duration
//   1a length bytes     issuetype
//   22 length bytes     node
//   2a length bytes     rtaidclient
//
// All but the timestamp are always written, so a default record is 10 00 1a 00 22 00 2a 00. Strings are bytes, in
// whatever encoding they came.
//
// A reader takes a field as its declared type, whatever type its tag carries; the last of several values of a field
// counts; unknown fields are skipped and forgotten; an end-group tag ends the record.
//
// Owner: whoever makes it; plain data. Threads: one record is for one thread at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include "diagnostics/pylon/MetricMessage.h"

namespace pylonmetrics {

// The meaning of the values is the metric service's: here they are only carried.
class AudioIssueDetected final : public MetricMessage {
 public:
  AudioIssueDetected() noexcept = default;
  // A timestamp that isn't set is not copied, whatever value is behind it.
  AudioIssueDetected(const AudioIssueDetected& other);
  // Leaves the other's strings empty and its timestamp not set.
  AudioIssueDetected(AudioIssueDetected&& other) noexcept;
  AudioIssueDetected& operator=(const AudioIssueDetected& other);
  AudioIssueDetected& operator=(AudioIssueDetected&& other) noexcept;
  ~AudioIssueDetected() override = default;

  // An empty input is a record without fields. A failure is a value that is cut off or of a type that can't be skipped.
  bool readFrom(WireReader& reader) override;
  // Adds to what the writer has. Reading it back gives an equal record.
  void writeTo(WireWriter& writer) const override;
  // The timestamp only when it was set.
  void formatText(TextFormatter& formatter, std::string_view name) const override;

  // The kind of issue, as "glitch".
  const std::string& issuetype() const noexcept { return issuetype_; }
  void setIssuetype(std::string bytes) noexcept { issuetype_ = std::move(bytes); }
  // The node of the audio graph on which it was seen.
  const std::string& node() const noexcept { return node_; }
  void setNode(std::string bytes) noexcept { node_ = std::move(bytes); }
  // The real-time-audio client that it concerns.
  const std::string& rtaidclient() const noexcept { return rtaidclient_; }
  void setRtaidclient(std::string bytes) noexcept { rtaidclient_ = std::move(bytes); }
  // A timestamp of 0 that was set is one too.
  bool hasTimestamp() const noexcept { return (has_ & kHasTimestamp) != 0; }
  // 0 unless it was set.
  std::uint64_t timestamp() const noexcept { return hasTimestamp() ? timestamp_ : 0; }
  void setTimestamp(std::uint64_t timestamp) noexcept;
  // How long the issue lasted, in whole seconds.
  std::int32_t duration() const noexcept { return duration_; }
  void setDuration(std::int32_t duration) noexcept { duration_ = duration; }

  // Equal records have equal hash values. The same on every machine: of the strings' hashes, the duration's 32 bits and
  // the timestamp.
  std::uint64_t hash_value() const noexcept;  // NOLINT(readability-identifier-naming): the runtime's name for it

  // Timestamps count when they are set.
  friend bool operator==(const AudioIssueDetected& a, const AudioIssueDetected& b) noexcept;
  friend void swap(AudioIssueDetected& a, AudioIssueDetected& b) noexcept;

 private:
  static constexpr std::uint32_t kHasTimestamp = 1U << 0U;

  // Takes the value of one of the five fields.
  void readField(WireReader& reader, std::uint64_t number);

  std::string issuetype_;
  std::string node_;
  std::string rtaidclient_;
  std::uint64_t timestamp_ = 0;
  std::int32_t duration_ = 0;
  std::uint32_t has_ = 0;  // which of the fields that may be missing were set
};

void swap(AudioIssueDetected& a, AudioIssueDetected& b) noexcept;

}  // namespace pylonmetrics
