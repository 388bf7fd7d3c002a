#include "host/socket/SocketConnection.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>

#include "host/log/LogFloodGuard.h"
#include "host/log/PrefixedLog.h"
#include "host/ring/ReceivedDescriptors.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "SocketConnection";
// Replies that are sent before the turn's end, so that a gulp of small requests doesn't pile up large replies.
constexpr std::size_t kEarlyFlushBytes = 262144;
// While a client has more requests to be served, its replies are gathered up to so many bytes and for so many turns.
constexpr std::size_t kGatheredReplyBytes = 4096;
constexpr int kMostFlushesPutOff = 8;
// Received bytes in a unit of cost.
constexpr std::size_t kReceivedBytesPerCost = 8192;
// Of the end of a connection.
constexpr std::size_t kEndCost = 24;
// Numbers of a reply that are encoded at once, and in a unit of cost.
constexpr std::size_t kNumbersAtOnce = 2048;
constexpr std::size_t kNumbersPerCost = 128;

ucred peerOf(const UniqueDescriptor& socket) {
  ucred peer{.pid = 0, .uid = static_cast<uid_t>(-1), .gid = static_cast<gid_t>(-1)};
  socklen_t size = sizeof peer;
  static_cast<void>(::getsockopt(socket.get(), SOL_SOCKET, SO_PEERCRED, &peer, &size));
  return peer;
}

}  // namespace

SocketConnection::SocketConnection(ConnectionHost& host, UniqueDescriptor socket, std::uint64_t number)
    : ShareHolder(host.shares.partyOf(peerOf(socket).uid)),
      host_(host),
      socket_(std::move(socket)),
      client_{.connection = number},
      frames_(host.limits.maxFrameBytes),
      lane_(host.loop.queue().get()),
      use_(party(), host.limits.quotas),
      output_(host.ledger) {
  const ucred peer = peerOf(socket_);
  client_.process = peer.pid;
  client_.user = peer.uid;
  description_ = describe(client_);
}

SocketConnection::~SocketConnection() = default;

void SocketConnection::setExportedObject(std::shared_ptr<platform::TarnReportingServiceProtocol> object) {
  object_ = std::move(object);
}

void SocketConnection::resume() {
  if (state_ != State::Fresh) return;
  state_ = State::Open;
  ++host_.ledger.connectionsOpen;
  ++host_.ledger.connectionsTotal;
  host_.add(*this);
  ++party().connections;
  watch(EPOLLIN);
}

void SocketConnection::refuse(std::string why) {
  refusal_ = std::move(why);
  resume();
}

// Keeps the system's idea of what to wait for in step; asks it only when something changes.
void SocketConnection::watch(std::uint32_t events) {
  if (events == watchedEvents_) return;
  const std::uint32_t before = std::exchange(watchedEvents_, events);
  if (events == 0) {
    host_.loop.unwatch(socket_.get());
  } else if (before != 0) {
    host_.loop.change(socket_.get(), events);
  } else if (host_.loop.watch(socket_.get(), events, shared_from_this()).failed()) {
    watchedEvents_ = 0;
    cut(CutReason::Reset, "can't wait for it" + errorSuffix(errno));
  }
}

void SocketConnection::handleEvents(std::uint32_t events) {
  const LogClientScope scope(client_);
  if ((events & EPOLLOUT) != 0) {
    flush();
  }
  if (state_ != State::Open || (events & (EPOLLIN | EPOLLHUP | EPOLLERR)) == 0) return;
  if ((events & EPOLLHUP) != 0) {
    peerGone_ = true;
    host_.ends.begin(end_);
  }
  if (host_.takesFrom(&party())) {
    inputWaits_ = true;
    host_.shares.ready(self());
  } else {
    stopAtHead(events);
  }
}

void SocketConnection::stopAtHead(std::uint32_t events) {
  inputWaits_ = true;
  if (!heldRequest_ && lane_.empty()) {
    bool received = false;
    while (state_ == State::Open && !heldRequest_) {
      if (!serveNextFrame() && (std::exchange(received, true) || !receive())) return;
    }
    return;
  }
  if ((events & (EPOLLHUP | EPOLLERR)) != 0) {
    // The peer is gone. That keeps until the request that it left could be served.
    output_.breakOff();
    watch(0);
  } else {
    watch(watchedEvents_ & ~std::uint32_t{EPOLLIN});
  }
}

bool SocketConnection::receive() {
  const auto space = frames_.space();
  const auto size = std::min(space.size(), host_.limits.gulpBytes);
  const ssize_t bytes = receiveWithDescriptors(socket_.get(), space.first(size), descriptors_);
  if (bytes > 0) {
    inputWaits_ = static_cast<std::size_t>(bytes) == size;
    frames_.received(static_cast<std::size_t>(bytes));
    lane_.spend(static_cast<std::size_t>(bytes) / kReceivedBytesPerCost);
    return true;
  }
  inputWaits_ = false;
  if (bytes == 0) {
    peerEnded(output_.resetSeen());
  } else if (errno != EAGAIN && errno != EINTR) {
    peerEnded(true);
  }
  return false;
}

ShareHolder::Turn SocketConnection::takeTurn(std::int64_t credit) {
  const LogClientScope scope(client_);
  if (state_ == State::Open && (watchedEvents_ & EPOLLIN) == 0) {
    watch(watchedEvents_ | EPOLLIN);
  }
  lane_.beginTurn(credit);
  bool more = true;
  while (more && lane_.hasTurn()) {
    more = serveNext();
    if (heldRequest_) break;
  }
  countSessions();
  if (!more) {
    countWaitingBytes(state_ == State::Open ? frames_.pendingBytes() : 0);
  }
  return {lane_.spent() + std::exchange(ringCost_, 0), more};
}

void SocketConnection::countSessions() {
  use_.noteSessions(object_ != nullptr ? object_->sessionCount() : 0);
  noteLogBytes();
}

void SocketConnection::noteLogBytes() {
  use_.noteLogBytes(object_ != nullptr ? object_->logBytes() : 0);
}

// The request that is held, and input that waits for the rest of its frame: so much of it.
void SocketConnection::countWaitingBytes(std::size_t half) {
  if (half != 0 || halfFrame_) {
    host_.halfFrames.note(halfFrame_, weak_from_this(), half, std::exchange(framesTaken_, false),
                          host_.loop.clock().monotonic());
  }
  use_.noteWaitingBytes(half + (heldRequest_ ? heldBytes_ : 0));
  if (half != 0) {
    host_.watchHalfFrames();
  }
}

void SocketConnection::endHalfFrame(const std::string& why) {
  cut(CutReason::StaleFrame, why);
}

void SocketConnection::finishWork() {
  const LogClientScope scope(client_);
  while (!lane_.empty()) {
    lane_.beginTurn(FairShares::kQuantum);
    host_.loop.queue()->runLane(lane_);
  }
}

bool SocketConnection::serveNext() {
  if (!lane_.empty()) {
    host_.loop.queue()->runLane(lane_);
    return true;
  }
  if (state_ != State::Open) return false;
  if (heldRequest_) {
    host_.gate.countReleased();
    wire::DecodedRequest request = std::move(*heldRequest_);
    heldRequest_.reset();
    countWaitingBytes(0);
    serveRequest(request, heldBytes_);
    return true;
  }
  return serveNextFrame() || (inputWaits_ && state_ == State::Open && receive());
}

bool SocketConnection::serveNextFrame() {
  std::span<const std::byte> frame;
  switch (frames_.next(frame)) {
    case wire::FrameBuffer::Next::Frame:
      serveFrame(frame);
      return true;
    case wire::FrameBuffer::Next::Incomplete:
      if (!inputWaits_ && frames_.pendingBytes() == 0 && host_.ledger.connectionsOpen > host_.limits.keptBuffers) {
        frames_.release();
      }
      return false;
    case wire::FrameBuffer::Next::Oversize:
      cut(CutReason::OversizeFrame, "frame of " + std::to_string(frames_.announcedBytes()) + " bytes, " +
                                        std::to_string(host_.limits.maxFrameBytes) + " are allowed");
      return true;
  }
  return false;
}

void SocketConnection::serveFrame(std::span<const std::byte> frame) {
  ++host_.ledger.framesReceived;
  framesTaken_ = true;
  wire::DecodedRequest& request = host_.request;
  switch (host_.decoder.decode(frame, request, host_.refusal)) {
    case wire::DecodeVerdict::Ok:
      serveRequest(request, frame.size());
      break;
    case wire::DecodeVerdict::Refused:
      lane_.spend(costOf(request, frame.size()));
      host_.ledger.countRefusal(host_.refusal.code);
      sendError(request.id, {wire::kErrorDomain, static_cast<std::int64_t>(host_.refusal.code), host_.refusal.text});
      break;
    case wire::DecodeVerdict::Unreadable:
      cut(CutReason::UnreadableFrame, "unreadable frame: " + host_.refusal.text);
      break;
  }
}

// The socket then yields what came before and its end, in this order.
void SocketConnection::endInput() {
  if (socket_) {
    ::shutdown(socket_.get(), SHUT_RD);
  }
}

template <class... Content>
void SocketConnection::reply(const Content&... content) {
  if ((state_ != State::Open && state_ != State::Ending) || output_.broken()) {
    output_.countDropped();
    return;
  }
  output_.append(content...);
  const bool waitsForRoom = (watchedEvents_ & EPOLLOUT) != 0;
  if (output_.unsentBytes() > (waitsForRoom ? host_.limits.maxUnreadReplyBytes : kEarlyFlushBytes)) {
    flush();
  } else if (!waitsForRoom && !flushAsked_) {
    flushAsked_ = true;
    host_.loop.flushLater(shared_from_this());
  }
}

void SocketConnection::sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) {
  reply(id, results);
}

void SocketConnection::sendNumbers(std::uint64_t id, std::vector<std::int64_t> numbers) {
  sendRest({id, std::move(numbers)});
}

// In the connection's own line, ahead of its next request.
void SocketConnection::sendRest(NumbersReply numbers) {
  numbers.encode(kNumbersAtOnce);
  if (numbers.whole()) {
    reply(numbers);
    return;
  }
  lane_.spend(kNumbersAtOnce / kNumbersPerCost);
  const bool isTurn = WorkLane::currentOf(host_.loop.queue().get()) == &lane_;
  host_.loop.queue()->asyncIn(lane_, [this, rest = std::move(numbers)]() mutable { sendRest(std::move(rest)); });
  if (!isTurn) {
    host_.shares.ready(self());
  }
}

void SocketConnection::sendError(std::uint64_t id, const platform::RemoteError& error) {
  reply(id, error);
}

bool SocketConnection::gathersReplies() {
  if (queued() && host_.gathersReplies && host_.gate.open() && output_.unsentBytes() < kGatheredReplyBytes &&
      flushesPutOff_ < kMostFlushesPutOff) {
    ++flushesPutOff_;
    return true;
  }
  flushesPutOff_ = 0;
  return false;
}

void SocketConnection::flush() {
  const LogClientScope scope(client_);
  flushAsked_ = gathersReplies();
  if (flushAsked_) {
    host_.loop.flushLater(shared_from_this());
    return;
  }
  if (!socket_ || !output_.sendSome(socket_.get())) return;
  const std::size_t unsent = output_.unsentBytes();
  if (state_ != State::Open) {
    if (unsent > host_.limits.maxUnreadReplyBytes) {
      output_.breakOff();
    }
  } else if (unsent > host_.limits.maxUnreadReplyBytes) {
    cut(CutReason::UnreadReplies, std::to_string(unsent) + " bytes of replies left unread");
  } else if (unsent != 0) {
    watch(watchedEvents_ | EPOLLOUT);
  } else {
    watch(watchedEvents_ & ~std::uint32_t{EPOLLOUT});
  }
}

void SocketConnection::peerEnded(bool reset) {
  const std::size_t half = frames_.pendingBytes();
  if (half != 0) {
    cut(CutReason::HalfFrame, "ended inside a frame, " + std::to_string(half) + " bytes of it came");
    return;
  }
  if (reset) {
    host_.ledger.countCut(CutReason::Reset);
  }
  beginEnd(reset);
}

void SocketConnection::cut(CutReason reason, const std::string& why) {
  host_.ledger.countCut(reason);
  logPrefixed(host_.log, kConnectionCategory, platform::LogLevel::Error, kModule,
              "cut off " + description() + ": " + why);
  beginEnd(true);
}

void SocketConnection::beginEnd(bool interrupted) {
  state_ = interrupted ? State::Ended : State::Ending;
  host_.ends.begin(end_);
  if (heldRequest_) {
    host_.gate.countReleased();
    heldRequest_.reset();
  }
  countWaitingBytes(0);
  watch(0);
  if (interrupted) {
    output_.drop();
    socket_.reset();
  }
  const auto ended = [connection = shared_from_this(), interrupted] {
    // Run by takeTurn(), while the connection lives.
    connection->host_.loop.queue()->asyncIn(connection->lane_,
                                            [ending = connection.get(), interrupted] { ending->finish(interrupted); });
    connection->host_.shares.ready(connection);
  };
  if (rings_ != nullptr) {
    rings_->end(ended);  // what was posted is served before the sessions stop
  } else {
    ended();
  }
}

void SocketConnection::finish(bool interrupted) {
  lane_.spend(kEndCost);
  flush();
  output_.drop();
  state_ = State::Ended;
  socket_.reset();
  --host_.ledger.connectionsOpen;
  host_.remove(*this);
  if (auto handler = std::exchange(interruptionHandler_, {}); handler && interrupted) {
    handler();
  }
  if (auto handler = std::exchange(invalidationHandler_, {})) {
    handler();
  }
  object_.reset();
  rings_.reset();
  countSessions();
  --party().connections;
  // After what the handlers left to be done.
  host_.loop.queue()->asyncIn(lane_, [host = &host_, place = end_] { host->ends.finish(place); });
}

}  // namespace tarn::linux_host
