// SPDX-License-Identifier: Apache-2.0
// TarnReportingDriverUtility: samples what the audio drivers count and tells a session what they counted while it ran.
//
// Use: getSnapShot when a session starts, sendDriverLogsForSession when it stops. The difference between the two goes
// into the session as up to three messages, one of simple counters, one of histograms and one of the times spent in
// states; each maps a key that names the channel to its number or text.
//
// A failure is logged and skips only the driver or channel that it concerns.
//
// One for the process: shared() makes it, which subscribes to the driver groups. What it holds doesn't change after
// that; the sessions' snapshots are their own. Threads: shared() any, the rest the server queue.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "diagnostics/drivers/TarnReportingIOChannelSubscription.h"
#include "platform/FlumeService.h"

namespace tarn {

class TarnReportingSession;

namespace plist {
class Dictionary;
}

// A sample costs what the drivers take for it, once for each subscription at a session's start and at its stop.
class TarnReportingDriverUtility {
 public:
  // Samples by the driver's description; a driver that could not be sampled is missing.
  using SnapShot = std::map<std::string, std::shared_ptr<const platform::FlumeSamples>>;

  // The process's one, made when there is none; nothing on a platform without report channels. Made under a lock, so
  // that two sessions don't subscribe twice.
  static std::shared_ptr<const TarnReportingDriverUtility> shared();

  // Without subscriptions. The service outlives the utility.
  explicit TarnReportingDriverUtility(platform::FlumeService& flume) : flume_(flume) {}
  // Subscribes to the driver groups that have channels; once. A group without channels has a line at info level; one
  // that can't be subscribed an error line with the service's code. Neither is tried again.
  void init();

  // In the order of the driver groups.
  const std::vector<TarnReportingIOChannelSubscription>& ioChannelSubscriptions() const noexcept {
    return ioChannelSubscriptions_;
  }

  // A sample of each subscription, now.
  SnapShot getSnapShot() const;
  // Sends what was counted since the snapshot; of a driver that the snapshot lacks, what the service makes of that. The
  // messages are of the category Flume and of the types Simple, Histogram and State, in this order; one that would be
  // empty isn't sent. A channel of another format has a line and is left out.
  void sendDriverLogsForSession(TarnReportingSession& session, const SnapShot& driverSnapShot) const;

  // Each adds the channel to `driverStats`, unless nothing was counted. Simple: the count, when it is at least 1.
  // Histogram: "count=,lower=,upper=,min=,max=,unit=::" with their values, then "lower-upper:hits" of each bucket with
  // hits, with ';' between them; the range that is told always holds 0. State:
  // "name:,transition:,residency:,duty_cycle:" with their values and a ';' for each state with a residency.
  static void processSimpleData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  static void processHistogramData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  static void processStateData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  // "OxbowFoo_Haptics_Stats_Simple_EngineOn": driver (up to its "<"), group, sub-group, type and channel, without their
  // own underscores and blanks; names that are missing are left out.
  static std::string getDriverStatsKey(const platform::FlumeChannelName& channel, std::string_view type);

 private:
  // The three payloads while they are gathered.
  struct DriverStats;

  // Adds the subscription of a group, or logs why there is none.
  void subscribe(const TarnReportingDriver& driver);
  // Adds the channel to the payload of its format.
  static void process(const platform::FlumeChannel& channel, DriverStats& stats);

  platform::FlumeService& flume_;
  std::vector<TarnReportingIOChannelSubscription> ioChannelSubscriptions_;  // constant after init
};

}  // namespace tarn
