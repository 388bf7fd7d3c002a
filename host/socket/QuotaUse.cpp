// SPDX-License-Identifier: Apache-2.0
#include "host/socket/QuotaUse.h"

#include <algorithm>
#include <utility>

#include "host/socket/Quotas.h"

namespace tarn::linux_host {

void QuotaUse::noteSessions(std::size_t sessions) noexcept {
  party_.sessions += sessions - std::exchange(sessions_, sessions);
}

void QuotaUse::noteWaitingBytes(std::size_t bytes) noexcept {
  party_.waitingBytes += bytes - std::exchange(waitingBytes_, bytes);
}

void QuotaUse::noteLogBytes(std::size_t bytes) noexcept {
  party_.logBytes += bytes - std::exchange(logBytes_, bytes);
  party_.largestLog = std::max(party_.largestLog, bytes);
}

std::string QuotaUse::refusalOfSession() const {
  if (sessions_ >= quotas_.sessionsPerConnection) {
    return overQuota("sessions", sessions_, quotas_.sessionsPerConnection);
  }
  if (party_.sessions >= quotas_.sessionsPerUser) {
    return overQuota("sessions", party_.sessions, quotas_.sessionsPerUser);
  }
  return {};
}

std::string QuotaUse::refusalOfWaitingBytes(std::size_t more) const {
  const std::size_t limit = quotas_.waitingBytesPerUser;
  if (party_.waitingBytes + more <= limit) return {};
  return overQuota("waiting_bytes", party_.waitingBytes, limit);
}

std::string QuotaUse::refusalOfLog() const {
  if (logBytes_ >= quotas_.logBytesPerConnection) {
    return overQuota("log_bytes", logBytes_, quotas_.logBytesPerConnection);
  }
  if (party_.logBytes >= quotas_.logBytesPerUser) {
    return overQuota("log_bytes", party_.logBytes, quotas_.logBytesPerUser);
  }
  return {};
}

std::string QuotaUse::refusalOfMessage(std::int64_t second) {
  if (beyondRate(rate_, quotas_.messagesPerSecondPerConnection, second)) {
    return overQuota("messages_per_second", rate_.messages, quotas_.messagesPerSecondPerConnection);
  }
  if (beyondRate(party_.rate, quotas_.messagesPerSecondPerUser, second)) {
    return overQuota("messages_per_second", party_.rate.messages, quotas_.messagesPerSecondPerUser);
  }
  return {};
}

}  // namespace tarn::linux_host
