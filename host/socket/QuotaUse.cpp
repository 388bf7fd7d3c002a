#include "host/socket/QuotaUse.h"

#include <utility>

#include "host/socket/Quotas.h"

namespace tarn::linux_host {

void QuotaUse::noteSessions(std::size_t sessions) noexcept {
  party_.sessions += sessions - std::exchange(sessions_, sessions);
}

void QuotaUse::noteWaitingBytes(std::size_t bytes) noexcept {
  party_.waitingBytes += bytes - std::exchange(waitingBytes_, bytes);
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
