// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionMap: a client's sessions by reporter ID, in the order in which the client made them.
//
// A client may have many sessions and asks for one with every message, so it is found by a hash; what lists or stops
// all of them goes by the order of creation, so that the same run always does the same in the same order. Those that
// run are known by themselves: a hundred thousand that don't are not gone through to find the one that does.
//
// Once it is listed it keeps the index of all clients' sessions in step.
//
// Threads: the server queue.
//
// A session under an ID that is stored again takes its forerunner's place, so a client that types its sessions one
// after the other doesn't shuffle them. Finding, storing and removing cost a hash look-up and a step in a tree; what
// visits sessions costs those that it visits.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <unordered_map>

namespace tarn {

class TarnReportingClientServerInstance;
class TarnReportingSession;
class TarnReportingSessionIndex;

// Owned by a client's instance. It owns the sessions but doesn't start or stop them: who does, says so to setRunning().
class TarnReportingSessionMap {
 public:
  using Session = std::shared_ptr<TarnReportingSession>;
  // A place in the order of creation. Places are given once and never again; a listing that remembers one finds its way
  // though sessions went meanwhile.
  using Place = std::uint64_t;

  TarnReportingSessionMap() = default;
  TarnReportingSessionMap(const TarnReportingSessionMap&) = delete;
  TarnReportingSessionMap& operator=(const TarnReportingSessionMap&) = delete;
  // Removes the sessions one by one, in order. A session's end may run work that asks this map, which then no longer
  // finds that session.
  ~TarnReportingSessionMap();

  // Tells the index what there is and from now on what changes, as the sessions of this client with this number in it.
  // Once, with all that was stored before. The client outlives its being listed.
  void list(std::shared_ptr<TarnReportingSessionIndex> index, std::uint64_t number,
            TarnReportingClientServerInstance& client);
  // Nobody else finds what is stored from now on. The map is empty.
  void unlist() noexcept { index_ = nullptr; }

  // The session under this ID, or nothing.
  Session find(std::int64_t reporterID) const;
  // Stores the session under this ID, as one that doesn't run; one that is there already is dropped and gives it its
  // place. The one that is dropped isn't stopped, and doesn't count as running any more. Without the memory for a new
  // one nothing has changed.
  void store(std::int64_t reporterID, Session session);
  // Drops the session, without stopping it; nothing happens when there is none.
  void remove(std::int64_t reporterID);
  // Notes that the session under this ID was started or stopped. Nothing happens when there is none, or when that is
  // known already. Needs no memory.
  void setRunning(std::int64_t reporterID, bool running) noexcept;
  // All of them, started or not.
  std::size_t size() const noexcept { return ordered_.size(); }
  // How many of them run.
  std::size_t runningCount() const noexcept { return running_.size(); }
  // The first of those that run, and of all; nothing when there is none.
  Session firstRunning() const { return running_.empty() ? nullptr : running_.begin()->second->session; }
  Session first() const { return ordered_.empty() ? nullptr : ordered_.begin()->second.session; }

  // Calls visit(session) for each that runs, in order, while it returns true; whether it always did. The map doesn't
  // change meanwhile.
  template <class Visit>
  bool forEachRunning(Visit&& visit) const {
    for (const auto& [place, entry] : running_) {
      if (!visit(entry->session)) return false;
    }
    return true;
  }
  // Calls visit(reporterID) for each from a place on, in order, while it returns true; whether it always did. Else
  // `from` is where to go on. The map may change between two calls; what has been stored since then comes at the end.
  template <class Visit>
  bool forEachFrom(Place& from, Visit&& visit) const {
    for (auto entry = ordered_.lower_bound(from); entry != ordered_.end(); ++entry) {
      from = entry->first + 1;
      if (!visit(entry->second.reporterID)) return false;
    }
    return true;
  }

 private:
  struct Entry;
  using Running = std::map<Place, const Entry*>;
  struct Entry {
    std::int64_t reporterID;
    Session session;
    Running::node_type whileNotRunning;  // its node of running_
  };

  // Tells the index, once listed.
  void noteRunning(std::ptrdiff_t more) noexcept;

  // The sessions in their order, those of them that run, and where an ID's session is. An entry of `running_` points
  // into `ordered_`, whose nodes stay where they are.
  std::map<Place, Entry> ordered_;
  Running running_;
  std::unordered_map<std::int64_t, Place> places_;
  Place nextPlace_ = 0;

  std::shared_ptr<TarnReportingSessionIndex> index_;  // null: not listed
  TarnReportingClientServerInstance* client_ = nullptr;
  std::uint64_t number_ = 0;  // in the index
};

}  // namespace tarn
