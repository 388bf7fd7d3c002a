// SPDX-License-Identifier: Apache-2.0
// ConfigurationReload: reads the configuration anew while the service runs, and has what may change then taken over.
//
//   request() -> work of the server queue: read and checked whole -> good: taken over, one generation more
//                                                                 -> bad: all stays as it is, an error line says why
//
// Requests that come before that work has begun are one: it reads what the files hold by then, which is the last that
// anybody wrote. What needs a restart stays as it was at the start and is named, in the log and in `status`.
//
// Owned by the platform. Threads: the main loop's.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "host/loop/MainLoop.h"
#include "host/loop/ServiceManager.h"
#include "host/settings/HostConfiguration.h"
#include "platform/Log.h"
#include "platform/UniqueFunction.h"
#include "plist/Dictionary.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class ConfigurationReload {
 public:
  // Reads all of it, with what options say in the place of what the files do.
  using Read = platform::UniqueFunction<Result<HostConfiguration>()>;
  // Puts it in force, as far as a running service can.
  using Adopt = platform::UniqueFunction<void(const HostConfiguration& inForce)>;

  // Loop, log and manager outlive it. Without `read` every reload is good and changes nothing.
  ConfigurationReload(MainLoop& loop, platform::Log& log, ServiceManager& manager, HostConfiguration inForce, Read read,
                      Adopt adopt);
  ConfigurationReload(const ConfigurationReload&) = delete;
  ConfigurationReload& operator=(const ConfigurationReload&) = delete;

  // Asks for one, and tells the service manager that it has begun; that it is over is told in any case.
  void request();
  // The part of `status`.
  void describe(plist::Dictionary& status) const;

 private:
  void reload();
  void takeOver(const HostConfiguration& read);
  void refuse(const std::string& why);

  MainLoop& loop_;
  platform::Log& log_;
  ServiceManager& manager_;
  HostConfiguration inForce_;
  Read read_;
  Adopt adopt_;
  bool requested_ = false;  // and not begun
  // Good ones since the start.
  std::int64_t generation_ = 0;
  std::int64_t refused_ = 0;
  double lastTime_ = 0;               // epoch seconds of the last one, good or bad; 0: none was
  std::string lastFault_;             // of the last one; empty: it was good
  std::vector<std::string> waiting_;  // settings that wait for a restart
};

}  // namespace tarn::linux_host
