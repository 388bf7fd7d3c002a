// PendingReplies: which replies are still to come, and which never will.
//
// Which problem: most replies come in the order of their requests, but a start's comes at the stop, and some starts are
// never answered. The service handles one connection's requests in order, so the client knows its sessions as the
// service does, and can tell:
//
//   start, start          the second finds the session running and is never answered
//   start, create         a create, a destroy and a change of type drop the session with the reply that it holds;
//   start, destroy        once they are answered, no earlier start of that session can be
//   start, start, stop    the stop answers the first start before itself, and no other
//
// Owned by one client. Threads: the owner's. Bounded by the client's limits on what it sends.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <map>
#include <unordered_map>
#include <utility>
#include <vector>

#include "client/Reply.h"
#include "wire/Request.h"

namespace tarn::client {

class PendingReplies {
 public:
  PendingReplies() = default;
  PendingReplies(const PendingReplies&) = delete;
  PendingReplies& operator=(const PendingReplies&) = delete;

  // A request was put in line. IDs ascend.
  void add(std::uint64_t id, const wire::Request& request, ReplyHandler handler);
  // The reply to `id` came, with an error or without. Whether somebody waits for it; then `handler` is theirs. Starts
  // that this reply rules out join the cancelled ones.
  bool take(std::uint64_t id, bool failed, ReplyHandler& handler);
  // Nobody waits for `id` any more.
  void forget(std::uint64_t id);
  // Takes a handler whose reply will never come; false when there is none.
  bool takeCancelled(ReplyHandler& handler);
  bool hasCancelled() const noexcept { return !cancelled_.empty(); }

  struct Rest {
    ReplyHandler handler;
    bool killedService = false;  // the request was killService, whose reply is the end of the connection
  };
  // Takes everything out, in the order of the requests.
  std::vector<Rest> takeAll();

  std::size_t size() const noexcept { return waiting_ + held_.size() + cancelled_.size(); }
  std::size_t waitingCount() const noexcept { return waiting_; }
  std::size_t heldCount() const noexcept { return held_.size(); }

 private:
  struct Entry {
    std::uint64_t id;
    std::int64_t reporterID;
    wire::Operation operation;
    bool endsStarts;  // once answered, earlier starts of this session never are
    bool done;
    ReplyHandler handler;
  };
  struct Session {
    std::uint16_t serviceType;
    bool started;
  };
  using HeldKey = std::pair<std::int64_t, std::uint64_t>;  // reporter ID, request ID

  bool noteRequest(const wire::Request& request);
  bool startsRunningSession(std::int64_t reporterID);
  void cancelStartsBefore(std::int64_t reporterID, std::uint64_t id);
  Entry* find(std::uint64_t id);
  void dropDone();

  std::deque<Entry> inOrder_;  // everything but starts, by ID; answered ones leave at the front
  std::size_t waiting_ = 0;    // of inOrder_, not done
  std::map<HeldKey, ReplyHandler> held_;
  std::unordered_map<std::uint64_t, std::int64_t> reporterOfHeld_;
  std::unordered_map<std::int64_t, Session> sessions_;
  std::deque<ReplyHandler> cancelled_;
};

}  // namespace tarn::client
