// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingSessionListing.h"

#include "service/TarnReportingClientServerInstance.h"
#include "service/TarnReportingServiceDelegateProtocol.h"
#include "service/TarnReportingSessionIndex.h"
#include "service/TarnReportingSlices.h"

namespace tarn {

namespace {

// IDs that are listed in a unit of cost.
constexpr std::size_t kListedAtOnce = 16;

}  // namespace

void TarnReportingSessionListing::proceed(const std::weak_ptr<TarnReportingServiceDelegateProtocol>& delegate) {
  const auto service = delegate.lock();
  if (!service) {
    reply_(std::nullopt, {});
    return;
  }
  const auto& clients = service->sessionIndex().clients();
  for (auto entry = clients.lower_bound(client_); entry != clients.end(); ++entry) {
    if (entry->first != client_) {
      client_ = entry->first;
      from_ = 0;
    }
    const bool whole = entry->second->clientReportingSessionMap().forEachFrom(from_, [&](std::int64_t reporterID) {
      reporters_.push_back(reporterID);
      return reporters_.size() % kListedAtOnce != 0 || !TarnReportingSpend(1);
    });
    if (!whole) {
      TarnReportingContinueLater([delegate, rest = std::move(*this)]() mutable { rest.proceed(delegate); });
      return;
    }
  }
  reply_(std::nullopt, std::move(reporters_));
}

}  // namespace tarn
