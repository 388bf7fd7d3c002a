// SPDX-License-Identifier: Apache-2.0
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

// One record a request: a queue of those that are answered in order, a table of held starts by session. Time hardly
// grows with the number of requests; cancelling takes as long as there are starts to cancel.
class PendingReplies {
 public:
  PendingReplies() = default;
  PendingReplies(const PendingReplies&) = delete;
  PendingReplies& operator=(const PendingReplies&) = delete;

  // A request was put in line, under an ID above all before. What it does to its session is noted here, since the
  // service handles requests in this order. A start of a session that runs already is among the cancelled ones at once.
  void add(std::uint64_t id, const wire::Request& request, ReplyHandler handler);
  // The reply to `id` came, with an error or without. Whether somebody waits for it; then `handler` is theirs (it may
  // be empty). Starts that this reply rules out join the cancelled ones; a failed request rules out none.
  bool take(std::uint64_t id, bool failed, ReplyHandler& handler);
  // Nobody waits for `id` any more; its reply will be dropped, but what it says of earlier starts still counts. Unknown
  // ones are ignored.
  void forget(std::uint64_t id);
  // Takes a handler whose reply will never come, the oldest first; false when there is none.
  bool takeCancelled(ReplyHandler& handler);
  bool hasCancelled() const noexcept { return !cancelled_.empty(); }

  // A request that ends with the connection.
  struct Rest {
    ReplyHandler handler;
    bool killedService = false;  // the request was killService, whose reply is the end of the connection
  };
  // Takes everything out, in the order of the requests, but for the cancelled ones. Sessions are forgotten, too: they
  // ended with the connection.
  std::vector<Rest> takeAll();

  // Handlers that are still to be called; of those, requests that wait for a reply, and starts that the service holds.
  std::size_t size() const noexcept { return waiting_ + held_.size() + cancelled_.size(); }
  std::size_t waitingCount() const noexcept { return waiting_; }
  std::size_t heldCount() const noexcept { return held_.size(); }

 private:
  // A request that is answered as soon as it is served.
  struct Entry {
    std::uint64_t id;
    std::int64_t reporterID;
    wire::Operation operation;
    bool endsStarts;  // once answered, earlier starts of this session never are
    // Answered; it leaves when all before it are.
    bool done;
    ReplyHandler handler;
  };
  // What the service knows of a session of this connection, once it has handled what was sent.
  struct Session {
    std::uint16_t serviceType;
    bool started;
  };
  using HeldKey = std::pair<std::int64_t, std::uint64_t>;  // reporter ID, request ID

  // Follows what a request does to its session. Whether its answer puts an end to earlier starts.
  bool noteRequest(const wire::Request& request);
  // Whether a start will find the session running; notes that it runs from here on.
  bool startsRunningSession(std::int64_t reporterID);
  // Moves the held starts of this session with lower IDs to the cancelled ones.
  void cancelStartsBefore(std::int64_t reporterID, std::uint64_t id);
  // Null when nobody waits for that ID. Looks by halves, since IDs ascend.
  Entry* find(std::uint64_t id);
  // Takes answered ones off the front.
  void dropDone();

  std::deque<Entry> inOrder_;  // everything but starts, by ID; answered ones leave at the front
  std::size_t waiting_ = 0;    // of inOrder_, not done
  // In the order of the sessions and then of the requests, so that a session's starts lie together.
  std::map<HeldKey, ReplyHandler> held_;
  // By request ID: a reply names nothing else.
  std::unordered_map<std::uint64_t, std::int64_t> reporterOfHeld_;
  // Those that this connection made, by reporter ID.
  std::unordered_map<std::int64_t, Session> sessions_;
  std::deque<ReplyHandler> cancelled_;
};

}  // namespace tarn::client
