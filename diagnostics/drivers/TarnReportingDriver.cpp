// SPDX-License-Identifier: Apache-2.0
#include "diagnostics/drivers/TarnReportingDriver.h"

#include <utility>

#include "plist/ValueView.h"

namespace tarn {

namespace {

void appendName(std::string& out, const TarnReportingDriver::Name& name) {
  plist::appendDescription(out, name ? plist::ValueView(*name) : plist::ValueView());
}

}  // namespace

TarnReportingDriver::TarnReportingDriver(Name groupName, Name subGroupName)
    : groupName_(std::move(groupName)), subGroupName_(std::move(subGroupName)) {}

TarnReportingDriver TarnReportingDriver::driverWithGroupName(Name groupName, Name subGroupName) {
  return {std::move(groupName), std::move(subGroupName)};
}

std::string TarnReportingDriver::description() const {
  std::string text;
  appendName(text, groupName_);
  text += '-';
  appendName(text, subGroupName_);
  return text;
}

}  // namespace tarn
