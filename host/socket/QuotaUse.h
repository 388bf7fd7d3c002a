// SPDX-License-Identifier: Apache-2.0
// QuotaUse: what one connection takes of its own and its user's quotas.
//
// It tells the user's counts of changes only, so that the sum over a user's connections is right without a walk. A
// connection tells 0 of everything when it ends.
//
// Owned by the connection. Threads: the main loop's.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

#include "host/socket/FairShares.h"
#include "host/socket/HostLimits.h"

namespace tarn::linux_host {

class QuotaUse {
 public:
  // Both outlive it; the party is that of the connection's user.
  QuotaUse(ShareParty& party, const HostLimits::Quotas& quotas) noexcept : party_(party), quotas_(quotas) {}
  QuotaUse(const QuotaUse&) = delete;
  QuotaUse& operator=(const QuotaUse&) = delete;

  // The connection has so many sessions, waiting bytes, or bytes of logs, by now.
  void noteSessions(std::size_t sessions) noexcept;
  void noteWaitingBytes(std::size_t bytes) noexcept;
  void noteLogBytes(std::size_t bytes) noexcept;

  // Why one more is beyond a quota, as the client is told ("over quota: ..."); empty when it is not. The connection's
  // own bound is asked before the user's.
  std::string refusalOfSession() const;
  // `more`: bytes of the request that would have to wait.
  std::string refusalOfWaitingBytes(std::size_t more) const;
  std::string refusalOfLog() const;
  // A message that isn't refused counts.
  std::string refusalOfMessage(std::int64_t second);
  // Whether messages are counted at all: by default nobody asks the clock for this.
  bool limitsMessages() const noexcept {
    return quotas_.messagesPerSecondPerConnection != 0 || quotas_.messagesPerSecondPerUser != 0;
  }

 private:
  ShareParty& party_;
  const HostLimits::Quotas& quotas_;
  std::size_t sessions_ = 0;  // as the party counts them
  std::size_t waitingBytes_ = 0;
  std::size_t logBytes_ = 0;
  MessageRate rate_;
};

}  // namespace tarn::linux_host
