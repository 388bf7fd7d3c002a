// SPDX-License-Identifier: Apache-2.0
// UserSessions: which clients run for which user, so that a user can be shown its own sessions and no others'.
//
// The service itself knows no users: it answers each client for all clients. Who may see less is answered from here.
//
// Owned by ConnectionHost; holds no client. Threads: the main loop's.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <map>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "platform/TarnReportingServiceProtocol.h"

namespace tarn::linux_host {

class UserSessions {
 public:
  using Client = platform::TarnReportingServiceProtocol;
  // Where a listing goes on: at a connection, and a place among its sessions.
  struct Place {
    std::int64_t connection = std::numeric_limits<std::int64_t>::min();
    std::uint64_t session = 0;
  };

  UserSessions() = default;
  UserSessions(const UserSessions&) = delete;
  UserSessions& operator=(const UserSessions&) = delete;

  // The connection of this number, which the user has, serves this client; until remove(), or the client's own end.
  void add(std::uint32_t user, std::int64_t connection, const std::shared_ptr<const Client>& client) {
    clients_.insert_or_assign({user, connection}, client);
  }
  // Nothing happens when there is none.
  void remove(std::uint32_t user, std::int64_t connection) noexcept { clients_.erase({user, connection}); }

  // The type of the user's session under this ID, the first one in the order of connection; nothing when there is none.
  // Costs a hash look-up for each of the user's connections.
  std::optional<std::uint16_t> serviceTypeOf(std::uint32_t user, std::int64_t reporterID) const;
  // Appends the IDs of at most so many of the user's sessions, connection by connection in their order and of one
  // connection at a time; whether there may be more, from `place` on. One that is there all the while is listed once.
  bool list(std::uint32_t user, Place& place, std::size_t atMost, std::vector<std::int64_t>& reporters) const;

 private:
  // By user, then in the order of connection.
  std::map<std::pair<std::uint32_t, std::int64_t>, std::weak_ptr<const Client>> clients_;
};

}  // namespace tarn::linux_host
