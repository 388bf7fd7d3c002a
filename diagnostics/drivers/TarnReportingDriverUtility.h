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

class TarnReportingDriverUtility {
 public:
  // Samples by the driver's description; a driver that could not be sampled is missing.
  using SnapShot = std::map<std::string, std::shared_ptr<const platform::FlumeSamples>>;

  // The process's one, made when there is none; nothing on a platform without report channels.
  static std::shared_ptr<const TarnReportingDriverUtility> shared();

  // Without subscriptions. The service outlives the utility.
  explicit TarnReportingDriverUtility(platform::FlumeService& flume) : flume_(flume) {}
  // Subscribes to the driver groups that have channels; once.
  void init();

  // In the order of the driver groups.
  const std::vector<TarnReportingIOChannelSubscription>& ioChannelSubscriptions() const noexcept {
    return ioChannelSubscriptions_;
  }

  SnapShot getSnapShot() const;
  // Sends what was counted since the snapshot; of a driver that the snapshot lacks, what the service makes of that.
  void sendDriverLogsForSession(TarnReportingSession& session, const SnapShot& driverSnapShot) const;

  // Each adds the channel to `driverStats`, unless nothing was counted.
  static void processSimpleData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  static void processHistogramData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  static void processStateData(const platform::FlumeChannel& channel, plist::Dictionary& driverStats);
  // "OxbowFoo_Haptics_Stats_Simple_EngineOn": driver (up to its "<"), group, sub-group, type and channel, without their
  // own underscores and blanks; names that are missing are left out.
  static std::string getDriverStatsKey(const platform::FlumeChannelName& channel, std::string_view type);

 private:
  struct DriverStats;

  void subscribe(const TarnReportingDriver& driver);
  static void process(const platform::FlumeChannel& channel, DriverStats& stats);

  platform::FlumeService& flume_;
  std::vector<TarnReportingIOChannelSubscription> ioChannelSubscriptions_;  // constant after init
};

}  // namespace tarn
