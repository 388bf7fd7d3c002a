// TarnReportingSessionMap: a client's sessions by reporter ID, in the order in which the client made them.
//
// A client may have many sessions and asks for one with every message, so it is found by a hash; what lists or stops
// all of them goes by the order of creation, so that the same run always does the same in the same order.
//
// Threads: the server queue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <unordered_map>

namespace tarn {

class TarnReportingSession;

class TarnReportingSessionMap {
 public:
  using Session = std::shared_ptr<TarnReportingSession>;

  // The session under this ID, or nothing.
  Session find(std::int64_t reporterID) const;
  // Stores the session under this ID; one that is there already is dropped and gives it its place.
  void store(std::int64_t reporterID, Session session);
  void remove(std::int64_t reporterID);
  void clear();
  std::size_t size() const noexcept { return ordered_.size(); }

  // Calls visit(reporterID, session) for each, in order.
  template <class Visit>
  void forEach(Visit&& visit) const {
    for (const auto& [place, entry] : ordered_) {
      visit(entry.reporterID, entry.session);
    }
  }

 private:
  struct Entry {
    std::int64_t reporterID;
    Session session;
  };

  std::map<std::uint64_t, Entry> ordered_;  // by place
  std::unordered_map<std::int64_t, std::uint64_t> places_;
  std::uint64_t nextPlace_ = 0;
};

}  // namespace tarn
