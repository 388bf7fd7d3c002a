// SPDX-License-Identifier: Apache-2.0
// Quotas: what one connection and one user may have, and the text that says so when there is no more. Honest clients
// never see it; it is there for those that loop, leak or mean harm.
//
// Threads: the main loop's.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "host/socket/FairShares.h"
#include "host/socket/HostLimits.h"
#include "plist/Dictionary.h"

namespace tarn::linux_host {

// "over quota: sessions 2000 of 2000": the quota's name as in the configuration, without whose it is, what is taken and
// the bound. The text of the error that the client gets.
std::string overQuota(std::string_view quota, std::size_t use, std::size_t limit);

// Whether one more message is beyond the rate; it counts when it isn't. A bound of 0 is none. The count begins anew
// with each second.
bool beyondRate(MessageRate& rate, std::size_t limit, std::int64_t second) noexcept;

// The bounds, and what each user that has connections has of them, at most 64 users, or only the one that is named;
// part of `status`. Keys of the users are their uids in decimal.
plist::Dictionary quotaStatus(const HostLimits::Quotas& quotas, const FairShares& shares,
                              std::optional<std::uint32_t> onlyUser = std::nullopt);

}  // namespace tarn::linux_host
