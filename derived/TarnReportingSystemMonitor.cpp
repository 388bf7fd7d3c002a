// SPDX-License-Identifier: Apache-2.0
#include "derived/TarnReportingSystemMonitor.h"

#include <array>
#include <utility>

#include "platform/Clock.h"
#include "platform/DefaultsStore.h"
#include "platform/Facilities.h"
#include "platform/NotificationCenter.h"
#include "plist/ThreadSafety.h"
#include "plist/Value.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingServiceDelegateCategory, "TarnReportingSystemMonitor"};
constexpr std::string_view kServiceSuite = "sys.oxbow.tarnkit";
constexpr std::string_view kUser = "mobile";

constexpr const char* kFeatureDomain = "feature_domain";
constexpr const char* kDefaultsDomain = "defaults_domain";
constexpr const char* kNotification = "notification";
constexpr const char* kNotifyToken = "notify_token";
constexpr const char* kTimestamp = "tarnreporting_timestamp";
constexpr const char* kSystemUptime = "systemuptime_sec";

struct Feature {
  std::string_view name;
  std::string_view defaultsDomain;  // empty: the value is the notification's state word
  std::string_view notification;
};
constexpr std::array<Feature, 3> kFeatures{{
    {"spatial-audio-accessory-feature", "sys.oxbow.homeshell",
     "sys.oxbow.homeshell.spatial-audio-accessory-feature.changed"},
    {"device_name", kServiceSuite, kTarnReportingChangeNotification},
    {"ringerstate", {}, "sys.oxbow.homeshell.ringerstate"},
}};

// The shared instance and the lock on it. Whatever ends it, its registrations end with it.
struct Shared {
  Shared() = default;
  ~Shared() { clear(); }
  Shared(const Shared&) = delete;
  Shared& operator=(const Shared&) = delete;

  void clear() {
    std::shared_ptr<TarnReportingSystemMonitor> ended;  // dies after the lock
    const MutexLock guard(lock);
    if (instance != nullptr) {
      instance->clear();
      ended = std::move(instance);
    }
  }

  Mutex lock;
  std::shared_ptr<TarnReportingSystemMonitor> instance TARN_GUARDED_BY(lock);
};

std::shared_ptr<TarnReportingSystemMonitor> currentInstance() {
  const auto shared = ProcessState::of<Shared>();
  const MutexLock guard(shared->lock);
  return shared->instance;
}

plist::Dictionary makeFeatures() {
  plist::Dictionary features;
  for (const Feature& feature : kFeatures) {
    plist::Dictionary description{{kFeatureDomain, feature.name}};
    if (!feature.defaultsDomain.empty()) {
      description.set(kDefaultsDomain, feature.defaultsDomain);
    }
    description.set(kNotification, feature.notification);
    features.set(feature.name, description);
  }
  return features;
}

// The value of a feature, absent when it can't be read.
plist::Value readFeature(std::string_view name, const plist::Dictionary& description) {
  const platform::Facilities& facilities = TarnReportingFacilities();
  if (const plist::ValueView domain = description.get(kDefaultsDomain); domain.present()) {
    return facilities.defaults.preference(name, domain.text(), kUser);
  }
  if (const plist::ValueView token = description.get(kNotifyToken); token.present()) {
    if (const auto state = facilities.notifications.state(static_cast<std::int32_t>(token.asInt64()))) {
      return *state == 1;
    }
  }
  return {};
}

// Whether two states of a feature say the same; when they were read doesn't count.
bool sameState(const plist::Dictionary& a, const plist::Dictionary& b) {
  static const std::array<plist::Key, 2> kStamps{plist::Key(kTimestamp), plist::Key(kSystemUptime)};
  return a.equalsIgnoring(b, kStamps);
}

}  // namespace

void TarnReportingSystemMonitor::initializeWithQueue(std::shared_ptr<platform::WorkQueue> queue) {
  const auto shared = ProcessState::of<Shared>();
  const MutexLock guard(shared->lock);
  if (shared->instance == nullptr) {
    shared->instance = initWithQueue(std::move(queue));
  }
}

std::shared_ptr<TarnReportingSystemMonitorDictionary> TarnReportingSystemMonitor::getSystemMonitorDictionary() {
  const auto instance = currentInstance();
  return instance == nullptr ? nullptr : instance->systemMonitorDictionary_;
}

std::vector<plist::Key> TarnReportingSystemMonitor::getSystemMonitorKeys() {
  std::vector<plist::Key> names;
  if (const auto instance = currentInstance()) {
    for (const auto& [name, description] : instance->features()) {
      names.push_back(name);
    }
  }
  return names;
}

void TarnReportingSystemMonitor::reset() {
  ProcessState::of<Shared>()->clear();
}

plist::Dictionary TarnReportingSystemMonitor::TarnReportingDefaults() {
  const platform::DefaultsStore& store = TarnReportingFacilities().defaults;
  plist::Dictionary defaults;
  const plist::Value name = store.value(kServiceSuite, "device_name");
  if (name.view().isText() || name.view().isNumber()) {
    defaults.set("device_name", name.view().asText());
  }
  const plist::Value disabled = store.value(kServiceSuite, "disable_reporting");
  if (disabled.present()) {
    defaults.set("disable_reporting", disabled.view().asBool());
  } else {
    defaults.set("disable_reporting", 0);
  }
  return defaults;
}

std::shared_ptr<TarnReportingSystemMonitor> TarnReportingSystemMonitor::initWithQueue(
    std::shared_ptr<platform::WorkQueue> queue) {
  auto monitor = std::make_shared<TarnReportingSystemMonitor>(FromInit(), std::move(queue));
  monitor->populateInitialValues();
  monitor->listenForFeatureStateChanges();
  return monitor;
}

TarnReportingSystemMonitor::TarnReportingSystemMonitor(FromInit, std::shared_ptr<platform::WorkQueue> queue)
    : defaults_(TarnReportingDefaults()),
      queue_(std::move(queue)),
      systemMonitorDictionary_(std::make_shared<TarnReportingSystemMonitorDictionary>()),
      features_(makeFeatures()) {}

void TarnReportingSystemMonitor::populateInitialValues() {
  kLog(LogLevel::Info, "populateInitialValues %@", [this] { return features(); });
  const MutexLock guard(*systemMonitorDictionary_);
  for (const auto& [name, description] : features_) {
    if (const plist::Dictionary state = getFeatureState(name.text()); !state.empty()) {
      systemMonitorDictionary_->store(name, state);
    }
  }
}

void TarnReportingSystemMonitor::listenForFeatureStateChanges() {
  kLog(LogLevel::Info, "listening for features %@", [this] { return features(); });
  const plist::Dictionary features = this->features();
  for (const auto& [name, description] : features) {
    listenForFeature(name, description.dictionary());
  }
}

void TarnReportingSystemMonitor::listenForFeature(const plist::Key& name, const plist::Dictionary& description) {
  // A handler that runs on another thread before the token is stored waits for it at the lock.
  const MutexLock guard(*systemMonitorDictionary_);
  const auto registration = TarnReportingFacilities().notifications.registerFor(
      description.get(kNotification).text(), queue_, [weakSelf = weak_from_this(), name](std::int32_t token) {
        if (const auto self = weakSelf.lock()) {
          self->featureChanged(name, token);
        }
      });
  if (registration.status == platform::NotificationCenter::kStatusOk) {
    plist::Dictionary registered = description;
    registered.set(kNotifyToken, registration.token);
    features_.set(name, registered);
  }
  kLog(LogLevel::Default, "notify setup result %i token %i", registration.status, registration.token);
}

void TarnReportingSystemMonitor::featureChanged(const plist::Key& name, std::int32_t token) {
  kLog(LogLevel::Info, "feature changes featureName=%@ token=%i", name.text(), token);
  {
    const MutexLock guard(*systemMonitorDictionary_);
    const plist::Dictionary state = getFeatureState(name.text());
    if (state.empty() || sameState(state, systemMonitorDictionary_->state(name))) return;
    systemMonitorDictionary_->store(name, state);
    kLog(LogLevel::Debug, "Updating value featureName=%@", name.text());
  }
  systemMonitorDictionary_->notifyObservers(name);
}

plist::Dictionary TarnReportingSystemMonitor::getFeatureState(std::string_view name) const {
  kLog(LogLevel::Default, "getting feature %@", name);
  const plist::Dictionary features = this->features();
  const plist::ValueView description = features.get(name);
  if (description.kind() != plist::Kind::Dictionary) return {};
  const plist::Value value = readFeature(name, description.dictionary());
  if (!value.present()) return {};
  const platform::Clock& clock = TarnReportingFacilities().clock;
  return {{name, value},
          {kTimestamp, clock.epochSeconds()},
          {kSystemUptime, static_cast<std::int64_t>(clock.systemUptimeSeconds())}};
}

plist::Dictionary TarnReportingSystemMonitor::features() const {
  const MutexLock guard(*systemMonitorDictionary_);
  return features_;
}

void TarnReportingSystemMonitor::clear() const {
  const plist::Dictionary features = this->features();
  for (const auto& [name, description] : features) {
    if (const plist::ValueView token = description.dictionary().get(kNotifyToken); token.present()) {
      TarnReportingFacilities().notifications.cancel(static_cast<std::int32_t>(token.asInt64()));
    }
  }
}

}  // namespace tarn
