// SPDX-License-Identifier: Apache-2.0
// TarnReportingDriver: names one group of driver report channels; either name may be missing, which matches any.
//
// A value that never changes. Threads: any.
#pragma once

#include <optional>
#include <string>

namespace tarn {

// Drivers sort their channels into groups and sub-groups; which ones are of interest is the utility's table.
class TarnReportingDriver {
 public:
  using Name = std::optional<std::string>;

  // Both may be missing, which means every channel.
  static TarnReportingDriver driverWithGroupName(Name groupName, Name subGroupName);

  // Nothing: any group, and any sub-group.
  const Name& groupName() const noexcept { return groupName_; }
  const Name& subGroupName() const noexcept { return subGroupName_; }
  // "%@-%@" of both; a missing one reads "(null)". Snapshots are kept under it.
  std::string description() const;

 private:
  TarnReportingDriver(Name groupName, Name subGroupName);

  Name groupName_;
  Name subGroupName_;
};

}  // namespace tarn
