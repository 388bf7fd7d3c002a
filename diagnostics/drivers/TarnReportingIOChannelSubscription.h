// SPDX-License-Identifier: Apache-2.0
// TarnReportingIOChannelSubscription: the subscription to the report channels of one driver group.
//
// Plain data, filled by TarnReportingDriverUtility and not changed afterwards.
#pragma once

#include <memory>
#include <utility>

#include "diagnostics/drivers/TarnReportingDriver.h"
#include "platform/FlumeService.h"

namespace tarn {

// Owner: the utility, for the life of the process. Threads: any may read.
struct TarnReportingIOChannelSubscription {
  // Subscribed to nothing yet.
  static TarnReportingIOChannelSubscription initWithDriver(TarnReportingDriver driver) {
    return {std::move(driver), nullptr, {}};
  }

  // What was asked for.
  TarnReportingDriver driver;
  std::shared_ptr<platform::FlumeSubscription> subscription;  // the service's handle
  platform::FlumeChannelSet subscribedChannels;               // those that were subscribed in fact
};

}  // namespace tarn
