// TarnReportingDriver: names one group of driver report channels; either name may be missing, which matches any.
//
// A value that never changes. Threads: any.
#pragma once

#include <optional>
#include <string>

namespace tarn {

class TarnReportingDriver {
 public:
  using Name = std::optional<std::string>;

  static TarnReportingDriver driverWithGroupName(Name groupName, Name subGroupName);

  const Name& groupName() const noexcept { return groupName_; }
  const Name& subGroupName() const noexcept { return subGroupName_; }
  // "%@-%@" of both; a missing one reads "(null)".
  std::string description() const;

 private:
  TarnReportingDriver(Name groupName, Name subGroupName);

  Name groupName_;
  Name subGroupName_;
};

}  // namespace tarn
