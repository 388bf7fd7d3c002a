// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/drivers/TarnReportingDriverUtility.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <optional>
#include <utility>

#include "platform/Facilities.h"
#include "plist/Dictionary.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

using platform::FlumeChannel;
using platform::FlumeFormat;

// What is gathered for a session, by the format of the channels.
struct TarnReportingDriverUtility::DriverStats {
  plist::Dictionary simple;
  plist::Dictionary histogram;
  plist::Dictionary state;
};

namespace {

constexpr TarnReportingLogger kLog{TarnReportingDriverUtilityCategory, "TarnReportingDriverUtility"};

struct DriverGroup {
  const char* group;     // null: any
  const char* subGroup;  // null: any
};

constexpr std::array<DriverGroup, 9> kDriverGroups{{{"OxbowAE2MCA", nullptr},
                                                    {"Speaker", nullptr},
                                                    {nullptr, "MCA"},
                                                    {"Haptics", "Stats"},
                                                    {"StateTransitionTimes_ms", nullptr},
                                                    {"Rx", nullptr},
                                                    {"Tx", nullptr},
                                                    {nullptr, "Tympan2"},
                                                    {"pdm", nullptr}}};

using Name = std::optional<std::string>;

plist::ValueView textOf(const Name& name) {
  return name ? plist::ValueView(*name) : plist::ValueView();
}

Name nameOf(const char* text) {
  return text == nullptr ? Name() : Name(text);
}

std::int64_t codeOf(const Status& error) {
  return error.failed() ? error->code : 0;
}

// Of sampling and of taking a difference alike.
void logSamplingError(const Status& error) {
  if (error.failed()) {
    kLog(LogLevel::Error, "FlumeCreateSamples error %li", error->code);
  }
}

void appendPart(std::string& key, std::string_view text) {
  for (const char character : text) {
    if (character != '_' && character != ' ') {
      key += character;
    }
  }
}

// As %f writes it, whatever the locale; not-a-number has no sign.
void appendSixDecimals(std::string& out, double value) {
  std::array<char, 330> digits;  // the longest double has 309 digits before the point
  const auto written = std::to_chars(digits.begin(), digits.end(), std::isnan(value) ? std::fabs(value) : value,
                                     std::chars_format::fixed, 6);
  out.append(digits.data(), written.ptr);
}

void send(TarnReportingSession& session, plist::Dictionary stats, AudioEventType type) {
  if (!stats.empty()) {
    session.sendMessage(
        std::make_shared<TarnReportingSessionMessage>(std::move(stats), AudioEventCategory::Flume, type));
  }
}

// The process's one and the lock on it.
struct Shared {
  Mutex lock;
  std::shared_ptr<const TarnReportingDriverUtility> utility TARN_GUARDED_BY(lock);
};

}  // namespace

std::shared_ptr<const TarnReportingDriverUtility> TarnReportingDriverUtility::shared() {
  const auto shared = ProcessState::of<Shared>();
  const MutexLock guard(shared->lock);
  platform::FlumeService* const flume = TarnReportingFacilities().flume;
  if (shared->utility == nullptr && flume != nullptr) {
    const auto utility = std::make_shared<TarnReportingDriverUtility>(*flume);
    utility->init();
    shared->utility = utility;
  }
  return shared->utility;
}

void TarnReportingDriverUtility::init() {
  kLog(LogLevel::Info, "creating flume driver utility");
  for (const DriverGroup& each : kDriverGroups) {
    subscribe(TarnReportingDriver::driverWithGroupName(nameOf(each.group), nameOf(each.subGroup)));
  }
}

void TarnReportingDriverUtility::subscribe(const TarnReportingDriver& driver) {
  const plist::ValueView group = textOf(driver.groupName());
  const plist::ValueView subGroup = textOf(driver.subGroupName());
  const auto channels = flume_.copyChannels(driver.groupName(), driver.subGroupName());
  if (channels.failed()) {
    kLog(LogLevel::Error, "error %li getting channels for driver %@-%@", codeOf(channels.error), group, subGroup);
  }
  if (channels.value == nullptr || channels.value->empty()) {
    kLog(LogLevel::Info, "couldn't find any channels for driver group %@-%@", group, subGroup);
    return;
  }
  auto made = TarnReportingIOChannelSubscription::initWithDriver(driver);
  const auto subscribed = flume_.subscribe(*channels.value);
  if (subscribed.subscription == nullptr || subscribed.channels == nullptr) {
    kLog(LogLevel::Error, "error %li creating subscription for %@-%@", codeOf(subscribed.error), group, subGroup);
    return;
  }
  made.subscription = subscribed.subscription;
  made.subscribedChannels = *subscribed.channels;
  ioChannelSubscriptions_.push_back(std::move(made));
  kLog(LogLevel::Info, "subscribed to group group %@-%@", group, subGroup);
}

TarnReportingDriverUtility::SnapShot TarnReportingDriverUtility::getSnapShot() const {
  SnapShot snapShot;
  for (const TarnReportingIOChannelSubscription& each : ioChannelSubscriptions_) {
    std::string driver = each.driver.description();
    kLog(LogLevel::Info, "sampling driver %@", driver);
    auto samples = flume_.createSamples(*each.subscription, each.subscribedChannels);
    logSamplingError(samples.error);
    if (samples.value != nullptr) {
      snapShot.insert_or_assign(std::move(driver), std::move(samples.value));
    }
  }
  return snapShot;
}

void TarnReportingDriverUtility::sendDriverLogsForSession(TarnReportingSession& session,
                                                          const SnapShot& driverSnapShot) const {
  DriverStats stats;
  for (const TarnReportingIOChannelSubscription& each : ioChannelSubscriptions_) {
    kLog(LogLevel::Info, "getting latest samples");
    auto samples = flume_.createSamples(*each.subscription, each.subscribedChannels);
    kLog(LogLevel::Info, "done getting latest samples");
    logSamplingError(samples.error);
    if (samples.value == nullptr) continue;
    const auto earlier = driverSnapShot.find(each.driver.description());
    const auto delta = flume_.createDelta(earlier == driverSnapShot.end() ? nullptr : earlier->second, samples.value);
    logSamplingError(delta.error);
    if (delta.value != nullptr) {
      std::for_each(delta.value->begin(), delta.value->end(), [&](const auto& channel) { process(channel, stats); });
    }
  }
  send(session, std::move(stats.simple), AudioEventType::Simple);
  send(session, std::move(stats.histogram), AudioEventType::Histogram);
  send(session, std::move(stats.state), AudioEventType::State);
}

void TarnReportingDriverUtility::process(const FlumeChannel& channel, DriverStats& stats) {
  switch (channel.format) {
    case FlumeFormat::Simple:
      return processSimpleData(channel, stats.simple);
    case FlumeFormat::State:
      return processStateData(channel, stats.state);
    case FlumeFormat::Histogram:
      return processHistogramData(channel, stats.histogram);
    case FlumeFormat::Invalid:
    case FlumeFormat::SimpleArray:
      return kLog(LogLevel::Debug, "Dropping sample of type : %hhu for group : %@ subgroup : %@",
                  static_cast<unsigned>(channel.format), textOf(channel.name.group), textOf(channel.name.subGroup));
  }
  kLog(LogLevel::Error, "The FlumeFormat %hhu is not supported group : %@ subgroup : %@",
       static_cast<unsigned>(channel.format), textOf(channel.name.group), textOf(channel.name.subGroup));
}

void TarnReportingDriverUtility::processSimpleData(const FlumeChannel& channel, plist::Dictionary& driverStats) {
  if (channel.value >= 1) {
    driverStats.set(plist::Key(getDriverStatsKey(channel.name, "Simple")), channel.value);
  }
}

void TarnReportingDriverUtility::processHistogramData(const FlumeChannel& channel, plist::Dictionary& driverStats) {
  // From 0: the range that is told always holds 0.
  std::int64_t lower = 0;
  std::int64_t upper = 0;
  std::string buckets;
  for (const platform::FlumeBucket& bucket : channel.buckets) {
    if (bucket.boundsError != 0) {
      kLog(LogLevel::Info, "Error in getting the bucket bounds : %d", bucket.boundsError);
    }
    lower = std::min(lower, bucket.lower);
    upper = std::max(upper, bucket.upper);
    if (bucket.hits != 0) {
      buckets +=
          std::to_string(bucket.lower) + "-" + std::to_string(bucket.upper) + ":" + std::to_string(bucket.hits) + ";";
    }
  }
  if (buckets.empty()) return;
  buckets.pop_back();
  std::string text = "count=" + std::to_string(channel.buckets.size()) + ",lower=" + std::to_string(lower) +
                     ",upper=" + std::to_string(upper) + ",min=" + std::to_string(channel.minimum) +
                     ",max=" + std::to_string(channel.maximum) + ",unit=";
  plist::appendDescription(text, textOf(channel.unit));
  text += "::";
  text += buckets;
  driverStats.set(plist::Key(getDriverStatsKey(channel.name, "Histogram")), text);
}

void TarnReportingDriverUtility::processStateData(const FlumeChannel& channel, plist::Dictionary& driverStats) {
  std::string text;
  for (const platform::FlumeState& state : channel.states) {
    if (state.residency != 0) {
      text += "name:" + state.name + ",transition:" + std::to_string(state.transitions) +
              ",residency:" + std::to_string(state.residency) + ",duty_cycle:";
      appendSixDecimals(text, state.dutyCycle);
      text += ';';
    }
  }
  if (!text.empty()) {
    kLog(LogLevel::Debug, "the current reported data is : %@", text);
    driverStats.set(plist::Key(getDriverStatsKey(channel.name, "State")), text);
  }
}

std::string TarnReportingDriverUtility::getDriverStatsKey(const platform::FlumeChannelName& channel,
                                                          std::string_view type) {
  std::string key;
  if (channel.driver) {
    // What follows tells instances of a driver apart and changes with every start.
    appendPart(key, std::string_view(*channel.driver).substr(0, channel.driver->find('<')));
    key += '_';
  }
  for (const Name* name : {&channel.group, &channel.subGroup}) {
    if (*name) {
      appendPart(key, **name);
      key += '_';
    }
  }
  key += type;
  key += '_';
  if (channel.name) {
    appendPart(key, *channel.name);
  }
  return key;
}

}  // namespace tarn
