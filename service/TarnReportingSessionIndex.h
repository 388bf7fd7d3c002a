// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionIndex: what all clients' sessions are together, so that nobody has to go through the clients for
// it: who has a session under an ID, which clients have sessions at all, how many there are and run.
//
// A thousand clients that only stay connected cost a message, a start or a broadcast nothing this way.
//
// Owned by the service and shared with its clients' instances, which keep it in step with their maps. Threads: the
// server queue; the service's lock guards it as it guards the list of clients.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <unordered_map>
#include <vector>

namespace tarn {

class TarnReportingClientServerInstance;

// All operations but addRunning() and the counts are a hash look-up and, for IDs that many clients use, a search
// through those. It holds clients by plain pointers: a client's map takes itself out before the client goes.
class TarnReportingSessionIndex {
 public:
  using Client = TarnReportingClientServerInstance;
  // Clients by their number, which is the order of connection.
  using Clients = std::map<std::uint64_t, Client*>;

  TarnReportingSessionIndex() = default;
  TarnReportingSessionIndex(const TarnReportingSessionIndex&) = delete;
  TarnReportingSessionIndex& operator=(const TarnReportingSessionIndex&) = delete;

  // The client has one more session, or one less, under this ID. `number` is the client's place in the order of
  // connection. The caller adds an ID of a client once; removing what isn't there changes nothing. Without the memory
  // for one more nothing has changed.
  void add(std::int64_t reporterID, std::uint64_t number, Client& client);
  void remove(std::int64_t reporterID, std::uint64_t number);
  // So many more sessions run; fewer, when it is negative. Which ones run is known to the clients' maps alone.
  void addRunning(std::ptrdiff_t count) noexcept { running_ += static_cast<std::size_t>(count); }

  // A client has another session under an ID that it had one under.
  void noteReplaced() noexcept { ++changes_; }
  // How often it changed who has which session: what was found holds as long as this stays.
  std::uint64_t changes() const noexcept { return changes_; }

  // The first client in the order of connection that has a session under this ID; null for none. Whether its session
  // runs doesn't matter.
  Client* firstHolder(std::int64_t reporterID) const;
  // Those that have sessions. In the order of connection, so what goes through them always goes in the same order.
  const Clients& clients() const noexcept { return clients_; }
  // Of all clients together, without the single-message session, which is no client's.
  std::size_t sessionCount() const noexcept { return sessionCount_; }
  // Those of them that are started.
  std::size_t runningCount() const noexcept { return running_; }

 private:
  struct Holder {
    std::uint64_t number;
    Client* client;
  };

  // Whether it was one. Leaves the counts alone.
  bool removeHolder(std::int64_t reporterID, std::uint64_t number) noexcept;

  // In the order of the clients. Mostly one; but a thousand clients may all number their sessions from 1.
  std::unordered_map<std::int64_t, std::vector<Holder>> holders_;
  // How many a client has, by its number: the first and the last one put the client in and take it out.
  std::unordered_map<std::uint64_t, std::size_t> sessionsOf_;
  Clients clients_;
  std::size_t sessionCount_ = 0;
  std::size_t running_ = 0;
  std::uint64_t changes_ = 0;
};

}  // namespace tarn
