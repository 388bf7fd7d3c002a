// TarnReportingSystemMonitor: a live picture of the few settings of the device that matter to audio analytics, and the
// service's own defaults.
//
// One shared instance for the process: made when the service starts, with the server queue, and kept
// until reset() or the end of the installation.
// Each setting is read once at creation, and again whenever the notification of its change comes; then the shared
// dictionary gets the new state and its observers are called.
//
// A setting without a defaults domain lives in the state word of its notification. The word can only be read with the
// token of a registration, so such a setting is unknown until its notification comes for the first time.
//
// Threads: creation and the class operations on any; notifications are handled on the queue.
#pragma once

#include <memory>
#include <string_view>
#include <vector>

#include "derived/TarnReportingSystemMonitorDictionary.h"
#include "plist/Dictionary.h"

namespace tarn {

namespace platform {
class WorkQueue;
}

// The notification that says that the service's own settings changed.
inline constexpr std::string_view kTarnReportingChangeNotification = "sys.oxbow.tarnkit.reporting";

class TarnReportingSystemMonitor : public std::enable_shared_from_this<TarnReportingSystemMonitor> {
  struct FromInit {
    explicit FromInit() = default;
  };

 public:
  // The shared instance. Makes it unless there is one.
  static void initializeWithQueue(std::shared_ptr<platform::WorkQueue> queue);
  // The shared instance's dictionary; null when there is no instance.
  static std::shared_ptr<TarnReportingSystemMonitorDictionary> getSystemMonitorDictionary();
  // The names of the features; empty when there is no instance.
  static std::vector<plist::Key> getSystemMonitorKeys();
  // Cancels all registrations of the shared instance and drops it.
  static void reset();

  // Reads the service's defaults: "device_name" (as text) when there is one, "disable_reporting" always, 0 when it is
  // not set.
  static plist::Dictionary TarnReportingDefaults();  // NOLINT(readability-identifier-naming): its given name

  // An instance beside the shared one, populated and listening.
  static std::shared_ptr<TarnReportingSystemMonitor> initWithQueue(std::shared_ptr<platform::WorkQueue> queue);
  TarnReportingSystemMonitor(FromInit, std::shared_ptr<platform::WorkQueue> queue);  // for initWithQueue
  TarnReportingSystemMonitor(const TarnReportingSystemMonitor&) = delete;
  TarnReportingSystemMonitor& operator=(const TarnReportingSystemMonitor&) = delete;

  void populateInitialValues();
  void listenForFeatureStateChanges();
  // Reads the feature's value and stamps it with "tarnreporting_timestamp" (epoch seconds) and "systemuptime_sec"
  // (whole seconds, cut off). Empty when the feature is unknown or its value can't be read.
  plist::Dictionary getFeatureState(std::string_view name) const;
  // The service's defaults as they were at creation.
  const plist::Dictionary& getDefaults() const noexcept { return defaults_; }
  // Feature name to description: "feature_domain", "defaults_domain" and "notification" where it has them, and
  // "notify_token" once it is registered.
  plist::Dictionary features() const;
  const std::shared_ptr<TarnReportingSystemMonitorDictionary>& systemMonitorDictionary() const noexcept {
    return systemMonitorDictionary_;
  }
  // Cancels the registration of every feature.
  void clear() const;

 private:
  void listenForFeature(const plist::Key& name, const plist::Dictionary& description);
  void featureChanged(const plist::Key& name, std::int32_t token);

  const plist::Dictionary defaults_;
  const std::shared_ptr<platform::WorkQueue> queue_;
  const std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary_;
  // Tokens are stored while handlers may read.
  plist::Dictionary features_ TARN_GUARDED_BY(*systemMonitorDictionary_);
};

}  // namespace tarn
