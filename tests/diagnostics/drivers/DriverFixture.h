// SPDX-License-Identifier: Apache-2.0
// Sessions with the driver snapshot worker, on report channels that the test sets.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "diagnostics/drivers/TarnReportingDriverUtility.h"
#include "diagnostics/drivers/TarnReportingSessionDriverSnapshotWorker.h"
#include "tests/session/SessionFixture.h"

namespace tarn::testing {

using platform::FlumeChannel;
using platform::FlumeChannelName;
using platform::FlumeFormat;

inline FlumeChannelName hapticsName(std::string name) {
  return {"OxbowFoo<0x12>", "Haptics", "Stats", std::move(name)};
}

inline FlumeChannel simpleChannel(FlumeChannelName name, std::int64_t value) {
  FlumeChannel channel;
  channel.name = std::move(name);
  channel.format = FlumeFormat::Simple;
  channel.value = value;
  return channel;
}

inline FlumeChannel histogramChannel(FlumeChannelName name, std::vector<platform::FlumeBucket> buckets) {
  FlumeChannel channel;
  channel.name = std::move(name);
  channel.format = FlumeFormat::Histogram;
  channel.unit = "us";
  channel.minimum = 3;
  channel.maximum = 17;
  channel.buckets = std::move(buckets);
  return channel;
}

inline FlumeChannel stateChannel(FlumeChannelName name, std::vector<platform::FlumeState> states) {
  FlumeChannel channel;
  channel.name = std::move(name);
  channel.format = FlumeFormat::State;
  channel.states = std::move(states);
  return channel;
}

class DriverFixture : public SessionFixture {
 public:
  DriverFixture() { useWorkers<ConsumerWorker, TarnReportingSessionDriverSnapshotWorker>(); }

 protected:
  using Step = FakeFlumeService::Step;

  // The payload of the one message of this type that the sessions' consumers got, without what the intake adds; empty
  // when there is none.
  static plist::Dictionary received(AudioEventType type) {
    plist::Dictionary payload;
    for (const auto& message : script().received) {
      if (message->type() == type) {
        EXPECT_TRUE(payload.empty()) << "more than one";
        EXPECT_EQ(message->category(), AudioEventCategory::Flume);
        payload = message->message();
      }
    }
    for (const char* key : {"tarnreporting_timestamp", "invalid_timestamp", "audiotag", "HostApplicationDisplayID"}) {
      payload.remove(key);
    }
    return payload;
  }
  static std::vector<AudioEventType> receivedTypes() {
    std::vector<AudioEventType> types;
    for (const auto& message : script().received) {
      types.push_back(message->type());
    }
    return types;
  }
  // What the utility logged, in order.
  std::vector<std::string> lines(LogLevel level) const {
    std::vector<std::string> found;
    for (const RecordingLog::Entry& entry : platform_.log.entries(level)) {
      if (entry.module == "TarnReportingDriverUtility") {
        EXPECT_EQ(entry.category, "tarnrd");
        found.push_back(entry.message());
      }
    }
    return found;
  }

  FakeFlumeService& flume_ = platform_.flume;
};

}  // namespace tarn::testing
