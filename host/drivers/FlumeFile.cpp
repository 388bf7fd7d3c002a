// SPDX-License-Identifier: Apache-2.0
#include "host/drivers/FlumeFile.h"

#include <array>
#include <cmath>
#include <cstdint>
#include <optional>
#include <set>
#include <utility>

#include "host/system/JsonValues.h"
#include "host/system/SystemError.h"
#include "plist/Dictionary.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

using platform::FlumeBucket;
using platform::FlumeChannel;
using platform::FlumeFormat;
using platform::FlumeState;

namespace {

Error wrong(std::string text) {
  return {0, std::move(text)};
}

constexpr std::size_t kMaximumNameInComplaint = 80;

constexpr std::array<std::pair<std::string_view, FlumeFormat>, 4> kFormats{{{"simple", FlumeFormat::Simple},
                                                                            {"state", FlumeFormat::State},
                                                                            {"histogram", FlumeFormat::Histogram},
                                                                            {"simplearray", FlumeFormat::SimpleArray}}};

std::optional<FlumeFormat> formatOf(const plist::ValueView& value) {
  for (const auto& [name, format] : kFormats) {
    if (value.isText() && value.text() == name) return format;
  }
  return std::nullopt;
}

// A double that is a whole number within the range; 2^63 and 2^64 are the first ones beyond it.
bool isWhole(const plist::ValueView& value, double lowest, double beyond) {
  const double number = value.doubleValue();
  return number == std::floor(number) && number >= lowest && number < beyond;
}

bool take(const plist::ValueView& value, std::int64_t& number) {
  number = value.asInt64();
  return value.kind() == plist::Kind::Signed ||
         (value.kind() == plist::Kind::Double && isWhole(value, -0x1p63, 0x1p63));
}

bool take(const plist::ValueView& value, std::uint64_t& number) {
  number = value.asUInt64();
  return value.kind() == plist::Kind::Unsigned || (value.kind() == plist::Kind::Signed && value.signedValue() >= 0) ||
         (value.kind() == plist::Kind::Double && isWhole(value, 0, 0x1p64));
}

bool take(const plist::ValueView& value, double& number) {
  number = value.asDouble();
  return value.isNumber() && value.kind() != plist::Kind::Bool;
}

// A member that may be missing.
bool take(const plist::ValueView& value, std::optional<std::string>& text) {
  if (value.isText()) {
    text = std::string(value.text());
  }
  return value.isText() || !value.present();
}

Status takeBuckets(const plist::ValueView& value, const FlumeFileBounds& bounds, FlumeChannel& channel) {
  if (value.kind() != plist::Kind::Array || value.array().size() > bounds.buckets) {
    return wrong("\"buckets\" must be a list of at most " + std::to_string(bounds.buckets) + " buckets");
  }
  const plist::Array list = value.array();
  for (const plist::ValueView& item : list) {
    const plist::Array numbers = item.kind() == plist::Kind::Array ? item.array() : plist::Array();
    FlumeBucket bucket;
    if (numbers.size() != 3 || !take(numbers[0], bucket.lower) || !take(numbers[1], bucket.upper) ||
        !take(numbers[2], bucket.hits) || bucket.hits < 0) {
      return wrong("a bucket must be [lower, upper, hits]");
    }
    channel.buckets.push_back(bucket);
  }
  return {};
}

Status takeStates(const plist::ValueView& value, const FlumeFileBounds& bounds, FlumeChannel& channel) {
  if (value.kind() != plist::Kind::Array || value.array().size() > bounds.states) {
    return wrong("\"states\" must be a list of at most " + std::to_string(bounds.states) + " states");
  }
  const plist::Array list = value.array();
  std::set<std::string> names;
  for (const plist::ValueView& item : list) {
    const plist::Dictionary members = item.kind() == plist::Kind::Dictionary ? item.dictionary() : plist::Dictionary();
    const plist::ValueView name = members["name"];
    FlumeState state;
    if (!name.isText() || !take(members["transitions"], state.transitions) ||
        !take(members["residency"], state.residency) || !take(members["duty_cycle"], state.dutyCycle)) {
      return wrong(R"(a state must have "name", "transitions", "residency" and "duty_cycle")");
    }
    state.name = std::string(name.text());
    if (!names.insert(state.name).second) return wrong("a state stands twice");
    channel.states.push_back(std::move(state));
  }
  return {};
}

Status takeNumbers(const plist::Dictionary& members, const FlumeFileBounds& bounds, FlumeChannel& channel) {
  switch (channel.format) {
    case FlumeFormat::Simple:
      return take(members["value"], channel.value) ? Status() : wrong("\"value\" must be a whole number");
    case FlumeFormat::Histogram:
      if (!take(members["min"], channel.minimum) || !take(members["max"], channel.maximum)) {
        return wrong(R"("min" and "max" must be whole numbers)");
      }
      return takeBuckets(members["buckets"], bounds, channel);
    case FlumeFormat::State:
      return takeStates(members["states"], bounds, channel);
    case FlumeFormat::Invalid:
    case FlumeFormat::SimpleArray:
      break;
  }
  return {};
}

Status takeChannel(const plist::ValueView& item, const FlumeFileBounds& bounds, FlumeChannel& channel) {
  const plist::Dictionary members = item.kind() == plist::Kind::Dictionary ? item.dictionary() : plist::Dictionary();
  if (!members["name"].isText()) return wrong("\"name\" must be a text");
  channel.name.name = std::string(members["name"].text());
  const std::optional<FlumeFormat> format = formatOf(members["format"]);
  if (!format) return wrong("\"format\" must be simple, histogram, state or simplearray");
  channel.format = *format;
  if (!take(members["unit"], channel.unit)) return wrong("\"unit\" must be a text");
  return takeNumbers(members, bounds, channel);
}

// Keeps the first complaint and counts the others.
class Complaints {
 public:
  void add(std::size_t number, const FlumeChannel& channel, const Error& complaint) {
    if (count_++ > 0) return;
    first_ = "channel " + std::to_string(number);
    if (channel.name.name && channel.name.name->size() <= kMaximumNameInComplaint) {
      first_ += " \"";
      plist::appendEscapedControls(first_, *channel.name.name);
      first_ += '"';
    }
    first_ += errorSuffix(complaint);
  }
  Status status() const {
    if (count_ == 0) return {};
    return wrong(count_ > 1 ? first_ + " (" + std::to_string(count_ - 1) + " more)" : first_);
  }

 private:
  std::string first_;
  std::size_t count_ = 0;
};

Result<platform::FlumeSamples> takeChannels(const plist::Array& list, const platform::FlumeChannelName& driver,
                                            const FlumeFileBounds& bounds) {
  Result<platform::FlumeSamples> reading;
  Complaints complaints;
  std::set<std::string> names;
  std::size_t number = 0;
  for (const plist::ValueView& item : list) {
    FlumeChannel channel;
    channel.name = driver;
    Status taken;
    if (++number > bounds.channels) {
      taken = wrong("a file has at most " + std::to_string(bounds.channels) + " channels");
    } else {
      taken = takeChannel(item, bounds, channel);
    }
    if (taken.ok() && !names.insert(*channel.name.name).second) {
      taken = wrong("the channel stands twice");
    }
    if (taken.ok()) {
      reading.value.push_back(std::move(channel));
    } else {
      complaints.add(number, channel, *taken);
    }
  }
  reading.error = complaints.status();
  return reading;
}

}  // namespace

Result<platform::FlumeSamples> parseFlumeFile(std::string_view text, const FlumeFileBounds& bounds) {
  const JsonReading json = readJson(text, kMaximumJsonNesting, JsonNull::Absent);
  if (json.fault) return {{}, wrong(json.fault->description())};
  if (json.value.kind() != plist::Kind::Dictionary) return {{}, wrong("must be an object")};
  const plist::Dictionary members = json.value.view().dictionary();
  platform::FlumeChannelName driver;
  if (!members["driver"].isText() || !take(members["driver"], driver.driver)) {
    return {{}, wrong("\"driver\" must be a text")};
  }
  if (!take(members["group"], driver.group) || !take(members["subgroup"], driver.subGroup)) {
    return {{}, wrong(R"("group" and "subgroup" must be texts)")};
  }
  if (members["channels"].kind() != plist::Kind::Array) return {{}, wrong("\"channels\" must be a list")};
  return takeChannels(members["channels"].array(), driver, bounds);
}

}  // namespace tarn::linux_host
