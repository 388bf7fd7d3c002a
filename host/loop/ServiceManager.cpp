// SPDX-License-Identifier: Apache-2.0
#include "host/loop/ServiceManager.h"

#include <systemd/sd-daemon.h>

#include <array>
#include <cstdio>
#include <cstdlib>

namespace tarn::linux_host {

void ServiceManager::notifyReady() {
  sd_notify(0, "READY=1");
}

void ServiceManager::notifyReloading(std::chrono::microseconds monotonicNow) {
  std::array<char, 64> told{};
  static_cast<void>(std::snprintf(told.data(), told.size(), "RELOADING=1\nMONOTONIC_USEC=%lld",
                                  static_cast<long long>(monotonicNow.count())));
  sd_notify(0, told.data());
}

void ServiceManager::notifyStatus(const std::string& line) {
  sd_notify(0, ("STATUS=" + line).c_str());
}

bool ServiceManager::listens() const {
  return std::getenv("NOTIFY_SOCKET") != nullptr;
}

void ServiceManager::notifyStopping(std::chrono::microseconds longest) {
  std::array<char, 64> told{};
  static_cast<void>(std::snprintf(told.data(), told.size(), "STOPPING=1\nEXTEND_TIMEOUT_USEC=%lld",
                                  static_cast<long long>(longest.count())));
  sd_notify(0, told.data());
}

void ServiceManager::notifyWatchdog() {
  sd_notify(0, "WATCHDOG=1");
}

std::optional<std::chrono::microseconds> ServiceManager::watchdogInterval() const {
  std::uint64_t microseconds = 0;
  if (sd_watchdog_enabled(0, &microseconds) <= 0) return std::nullopt;
  return std::chrono::microseconds(microseconds);
}

}  // namespace tarn::linux_host
