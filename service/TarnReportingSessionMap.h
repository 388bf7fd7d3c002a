// TarnReportingSessionMap: a client's sessions by reporter ID, in the order in which the client made them.
//
// A client may have many sessions and asks for one with every message, so it is found by a hash; what lists or stops
// all of them goes by the order of creation, so that the same run always does the same in the same order. Those that
// run are known by themselves: a hundred thousand that don't are not gone through to find the one that does.
//
// Once it is listed it keeps the index of all clients' sessions in step.
//
// Threads: the server queue.
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

class TarnReportingSessionMap {
 public:
  using Session = std::shared_ptr<TarnReportingSession>;
  // A place in the order of creation.
  using Place = std::uint64_t;

  TarnReportingSessionMap() = default;
  TarnReportingSessionMap(const TarnReportingSessionMap&) = delete;
  TarnReportingSessionMap& operator=(const TarnReportingSessionMap&) = delete;
  // Removes the sessions one by one, in order.
  ~TarnReportingSessionMap();

  // Tells the index what there is and from now on what changes, as the sessions of this client with this number in it.
  void list(std::shared_ptr<TarnReportingSessionIndex> index, std::uint64_t number,
            TarnReportingClientServerInstance& client);
  // Nobody else finds what is stored from now on. The map is empty.
  void unlist() noexcept { index_ = nullptr; }

  // The session under this ID, or nothing.
  Session find(std::int64_t reporterID) const;
  // Stores the session under this ID, as one that doesn't run; one that is there already is dropped and gives it its
  // place.
  void store(std::int64_t reporterID, Session session);
  void remove(std::int64_t reporterID);
  // Notes that the session under this ID was started or stopped.
  void setRunning(std::int64_t reporterID, bool running);
  std::size_t size() const noexcept { return ordered_.size(); }
  std::size_t runningCount() const noexcept { return running_.size(); }
  // The first of those that run, and of all; nothing when there is none.
  Session firstRunning() const { return running_.empty() ? nullptr : running_.begin()->second->session; }
  Session first() const { return ordered_.empty() ? nullptr : ordered_.begin()->second.session; }

  // Calls visit(session) for each that runs, in order, while it returns true; whether it always did.
  template <class Visit>
  bool forEachRunning(Visit&& visit) const {
    for (const auto& [place, entry] : running_) {
      if (!visit(entry->session)) return false;
    }
    return true;
  }
  // Calls visit(reporterID) for each from a place on, in order, while it returns true; whether it always did. Else
  // `from` is where to go on.
  template <class Visit>
  bool forEachFrom(Place& from, Visit&& visit) const {
    for (auto entry = ordered_.lower_bound(from); entry != ordered_.end(); ++entry) {
      from = entry->first + 1;
      if (!visit(entry->second.reporterID)) return false;
    }
    return true;
  }

 private:
  struct Entry {
    std::int64_t reporterID;
    Session session;
  };

  void noteRunning(std::ptrdiff_t more) noexcept;

  std::map<Place, Entry> ordered_;
  std::map<Place, const Entry*> running_;
  std::unordered_map<std::int64_t, Place> places_;
  Place nextPlace_ = 0;

  std::shared_ptr<TarnReportingSessionIndex> index_;  // null: not listed
  TarnReportingClientServerInstance* client_ = nullptr;
  std::uint64_t number_ = 0;  // in the index
};

}  // namespace tarn
