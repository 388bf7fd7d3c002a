// SPDX-License-Identifier: Apache-2.0
// MetricMessage: what every metric record can do: read itself from the wire, write itself to it, render itself as text.
//
// The order of the virtual operations is fixed: destructor, readFrom, writeTo, formatText. A base that is compiled
// apart from its records calls them by their places.
//
// Threads: one record is for one thread at a time.
#pragma once

#include <string_view>

namespace pylonmetrics {

class TextFormatter;
class WireReader;
class WireWriter;

// Copies are for the records themselves; a base is never copied alone.
class MetricMessage {
 public:
  virtual ~MetricMessage() = default;
  // Takes over the fields that the reader finds; false when it failed. What was read until then stays.
  virtual bool readFrom(WireReader& reader) = 0;
  // Fields in the order of their numbers; it can't fail.
  virtual void writeTo(WireWriter& writer) const = 0;
  // One object of this name with the fields in alphabetical order.
  virtual void formatText(TextFormatter& formatter, std::string_view name) const = 0;

 protected:
  MetricMessage() = default;
  MetricMessage(const MetricMessage&) = default;
  MetricMessage& operator=(const MetricMessage&) = default;
};

}  // namespace pylonmetrics
