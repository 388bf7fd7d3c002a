// SPDX-License-Identifier: Apache-2.0
#include "host/ConfigurationReload.h"

#include <chrono>
#include <new>
#include <string_view>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "platform/LogCondition.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "ConfigurationReload";

std::string listOf(const std::vector<std::string>& names) {
  std::string list;
  for (const std::string& name : names) {
    list.append(list.empty() ? "" : ", ").append(name);
  }
  return list;
}

}  // namespace

ConfigurationReload::ConfigurationReload(MainLoop& loop, platform::Log& log, ServiceManager& manager,
                                         HostConfiguration inForce, Read read, Adopt adopt)
    : loop_(loop),
      log_(log),
      manager_(manager),
      inForce_(std::move(inForce)),
      read_(std::move(read)),
      adopt_(std::move(adopt)) {}

void ConfigurationReload::request() {
  if (requested_) return;
  loop_.queue()->async([this] { reload(); });
  requested_ = true;
  manager_.notifyReloading(std::chrono::duration_cast<std::chrono::microseconds>(loop_.clock().monotonic()));
}

void ConfigurationReload::reload() {
  requested_ = false;
  lastTime_ = loop_.clock().epochSeconds();
  try {
    const Result<HostConfiguration> read = read_ ? read_() : Result<HostConfiguration>{inForce_, {}};
    read.ok() ? takeOver(read.value) : refuse(read.error->text);
  } catch (const std::bad_alloc&) {
    refuse("out of memory");
  }
  manager_.notifyReady();
}

void ConfigurationReload::takeOver(const HostConfiguration& read) {
  HostConfiguration next = inForce_;
  SettingChanges changes = adoptSettings(next, read);
  adopt_(next);
  inForce_ = std::move(next);
  waiting_ = std::move(changes.waiting);
  lastFault_.clear();
  ++generation_;
  std::string line = "configuration " + std::to_string(generation_) +
                     " is in force, changed: " + (changes.taken.empty() ? "nothing" : listOf(changes.taken));
  if (!waiting_.empty()) {
    line += "; these changed keys wait for a restart: " + listOf(waiting_);
  }
  logPrefixed(log_, kHostCategory, platform::LogLevel::Default, kModule, line);
}

void ConfigurationReload::refuse(const std::string& why) {
  ++refused_;
  lastFault_ = why;
  const platform::LogConditionScope condition(platform::LogCondition::ReloadRefused);
  logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule,
              "configuration " + std::to_string(generation_) + " stays in force: " + why);
}

void ConfigurationReload::describe(plist::Dictionary& status) const {
  status.set("configuration_generation", generation_);
  status.set("configuration_reloads_refused", refused_);
  status.set("configuration_reload_time", lastTime_);
  status.set("configuration_fault", lastFault_);
  plist::Array waiting;
  for (const std::string& name : waiting_) {
    waiting.append(name);
  }
  status.set("configuration_waiting", waiting);
}

}  // namespace tarn::linux_host
