// SPDX-License-Identifier: Apache-2.0
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
//
// There are three: "spatial-audio-accessory-feature" and "device_name", which are preferences of the device's user, and
// "ringerstate", which is a state word and true when that is 1.
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

// Handlers hold it weakly, so it goes with its last owner; its registrations go with clear().
class TarnReportingSystemMonitor : public std::enable_shared_from_this<TarnReportingSystemMonitor> {
  struct FromInit {
    explicit FromInit() = default;
  };

 public:
  // The shared instance. Makes it unless there is one. Notifications are handled on this queue; a queue that is given
  // later is ignored.
  static void initializeWithQueue(std::shared_ptr<platform::WorkQueue> queue);
  // The shared instance's dictionary; null when there is no instance.
  static std::shared_ptr<TarnReportingSystemMonitorDictionary> getSystemMonitorDictionary();
  // The names of the features; empty when there is no instance. All of them, whether their state is known or not.
  static std::vector<plist::Key> getSystemMonitorKeys();
  // Cancels all registrations of the shared instance and drops it. Workers that observe its dictionary keep that, which
  // no longer changes. Nothing happens when there is none.
  static void reset();

  // Reads the service's defaults: "device_name" (as text) when there is one, "disable_reporting" always, 0 when it is
  // not set. Asked of the store by each call. A "device_name" that is neither text nor number is left out.
  static plist::Dictionary TarnReportingDefaults();  // NOLINT(readability-identifier-naming): its given name

  // An instance beside the shared one, populated and listening. Its owner calls clear() before it lets go of it.
  static std::shared_ptr<TarnReportingSystemMonitor> initWithQueue(std::shared_ptr<platform::WorkQueue> queue);
  TarnReportingSystemMonitor(FromInit, std::shared_ptr<platform::WorkQueue> queue);  // for initWithQueue
  TarnReportingSystemMonitor(const TarnReportingSystemMonitor&) = delete;
  TarnReportingSystemMonitor& operator=(const TarnReportingSystemMonitor&) = delete;

  // Stores the state of every feature that can be read now, and tells nobody: nobody observes yet.
  void populateInitialValues();
  // Registers for each feature's notification and keeps the token. One that can't be registered for stays as it was
  // read; the line with status and token tells so.
  void listenForFeatureStateChanges();
  // Reads the feature's value and stamps it with "tarnreporting_timestamp" (epoch seconds) and "systemuptime_sec"
  // (whole seconds, cut off). Empty when the feature is unknown or its value can't be read.
  plist::Dictionary getFeatureState(std::string_view name) const;
  // The service's defaults as they were at creation.
  const plist::Dictionary& getDefaults() const noexcept { return defaults_; }
  // Feature name to description: "feature_domain", "defaults_domain" and "notification" where it has them, and
  // "notify_token" once it is registered. A copy, made under the dictionary's lock.
  plist::Dictionary features() const;
  const std::shared_ptr<TarnReportingSystemMonitorDictionary>& systemMonitorDictionary() const noexcept {
    return systemMonitorDictionary_;
  }
  // Cancels the registration of every feature. The states stay. A handler that runs at that moment comes to its end.
  void clear() const;

 private:
  void listenForFeature(const plist::Key& name, const plist::Dictionary& description);
  // Reads the feature again. A state that can't be read or says what is known changes nothing; else it is stored, and
  // observers are called without the lock. Stamps don't count as a difference.
  void featureChanged(const plist::Key& name, std::int32_t token);

  // Read once: the settings of a run are those of its beginning.
  const plist::Dictionary defaults_;
  const std::shared_ptr<platform::WorkQueue> queue_;
  const std::shared_ptr<TarnReportingSystemMonitorDictionary> systemMonitorDictionary_;
  // Tokens are stored while handlers may read.
  plist::Dictionary features_ TARN_GUARDED_BY(*systemMonitorDictionary_);
};

}  // namespace tarn
