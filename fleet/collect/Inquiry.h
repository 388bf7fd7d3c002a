// SPDX-License-Identifier: Apache-2.0
// Inquiry: finds what the database lacks: ids of a device that no message told of, though the device told of later ones
// or said that it is further. A stream may lose what it had acknowledged; the device may still have it.
//
//   note(devices of each group that was written) ... look() -> devices and ids to ask them for
//
// What is on its way isn't lacking: an id is asked for when two looks in a row found it missing. Only devices that
// messages came from since, or that lacked something, are looked at; all of them the first time. Each look also joins
// the ranges that such a device told of, so that the next one is short. Threads: one.
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "fleet/collect/Database.h"
#include "recorder/store/retention/IdRange.h"

namespace tarn::fleet {

struct LackedIds {
  std::string device;                     // its name
  std::vector<recorder::IdRange> ranges;  // rising, at most kMostRanges
};

class Inquiry {
 public:
  explicit Inquiry(Database& database) : database_(database) {}

  // The database's numbers of devices that something was written of.
  void note(const std::vector<std::int32_t>& devices) { touched_.insert(devices.begin(), devices.end()); }
  // Nothing while another collector looks. The error is the database's; nothing was changed then.
  Result<std::vector<LackedIds>> look();

 private:
  using Ranges = std::map<std::string, std::vector<recorder::IdRange>>;

  struct Found {
    Ranges ranges;  // by the device's name
    std::set<std::int32_t> devices;
    bool isMine = false;  // nobody else looks
    bool isCut = false;   // there is more
  };

  Result<Found> find();

  Database& database_;
  bool looksAtAll_ = true;
  std::set<std::int32_t> touched_;
  Ranges before_;  // what the last look found
};

}  // namespace tarn::fleet
