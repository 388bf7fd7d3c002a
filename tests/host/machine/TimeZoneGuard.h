// SPDX-License-Identifier: Apache-2.0
// TimeZoneGuard: puts the process into a time zone while it lives. Zones that are written out ("CET-1CEST,...") need no
// zone files. Threads: the test's, while no other looks at the time.
#pragma once

#include <cstdlib>
#include <ctime>
#include <optional>
#include <string>

namespace tarn::linux_host {

class TimeZoneGuard {
 public:
  explicit TimeZoneGuard(const char* zone) : TimeZoneGuard() { set(zone); }
  TimeZoneGuard() {
    if (const char* zone = std::getenv("TZ")) {
      before_ = zone;
    }
  }
  ~TimeZoneGuard() {
    if (before_) {
      set(before_->c_str());
    } else {
      ::unsetenv("TZ");
      ::tzset();
    }
  }
  TimeZoneGuard(const TimeZoneGuard&) = delete;
  TimeZoneGuard& operator=(const TimeZoneGuard&) = delete;

  static void set(const char* zone) {
    ::setenv("TZ", zone, 1);
    ::tzset();
  }

 private:
  std::optional<std::string> before_;
};

}  // namespace tarn::linux_host
