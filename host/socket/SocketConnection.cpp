// SPDX-License-Identifier: Apache-2.0
#include "host/socket/SocketConnection.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <new>

#include "host/log/LogFloodGuard.h"
#include "host/log/PrefixedLog.h"
#include "host/ring/ReceivedDescriptors.h"
#include "host/socket/OwnSessionsView.h"
#include "host/system/MemoryReserve.h"
#include "platform/LogCondition.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "SocketConnection";
// Received bytes in a unit of cost.
constexpr std::size_t kReceivedBytesPerCost = 8192;
// Bytes of replies that were sent since the turn before, likewise.
constexpr std::size_t kSentBytesPerCost = 4096;
// Of the end of a connection.
constexpr std::size_t kEndCost = 24;

ucred peerOf(const UniqueDescriptor& socket) {
  ucred peer{.pid = 0, .uid = static_cast<uid_t>(-1), .gid = static_cast<gid_t>(-1)};
  socklen_t size = sizeof peer;
  static_cast<void>(::getsockopt(socket.get(), SOL_SOCKET, SO_PEERCRED, &peer, &size));
  return peer;
}

}  // namespace

SocketConnection::SocketConnection(ConnectionHost& host, UniqueDescriptor socket, std::uint64_t number, Access access)
    : ShareHolder(host.shares.partyOf(peerOf(socket).uid)),
      host_(host),
      socket_(std::move(socket)),
      access_(access),
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
  host_.sessions.add(user(), number(), object);
  object_ = std::move(object);
  if (access_ == Access::OwnSessions) {
    object_ = std::make_shared<OwnSessionsView>(std::move(object_), host_.sessions, user(), host_.loop.queue());
  }
}

void SocketConnection::resume() {
  if (state_ != State::Fresh) return;
  state_ = State::Open;
  ++host_.ledger.connectionsOpen;
  ++host_.ledger.connectionsTotal;
  ++party().connections;
  const bool listens = MemoryReserve::orGiveUp(MemoryReserve::Loss::Connection, [this] {
    host_.add(*this);
    watch(EPOLLIN);
  });
  if (!listens && state_ == State::Open) {
    cut(CutReason::OutOfMemory, outOfMemoryText);
  }
}

void SocketConnection::refuse(std::string why) {
  refusal_ = std::move(why);
  resume();
}

void SocketConnection::leaveHost() noexcept {
  const auto self = shared_from_this();  // the loop may be the last one that holds it
  rings_.reset();
  if (std::exchange(watchedEvents_, 0) != 0) {
    host_.loop.unwatch(socket_.get());
  }
}

// Keeps the system's idea of what to wait for in step; asks it only when something changes.
void SocketConnection::watch(std::uint32_t events) {
  if (events == watchedEvents_) return;
  if (events == 0) {
    host_.loop.unwatch(socket_.get());
  } else if (watchedEvents_ != 0) {
    host_.loop.change(socket_.get(), events);
  } else if (const Status watched = host_.loop.watch(socket_.get(), events, shared_from_this()); watched.failed()) {
    cut(CutReason::Reset, [&] { return "can't wait for it" + errorSuffix(*watched); });
    return;
  }
  watchedEvents_ = events;
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
  std::span<std::byte> space;
  if (!MemoryReserve::orGiveUp(MemoryReserve::Loss::Connection, [&] { space = frames_.space(); })) {
    cut(CutReason::OutOfMemory, outOfMemoryText);
    return false;
  }
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
  mayTake_ = true;  // whoever gives the turns has asked just now
  bool more = true;
  while (more && lane_.hasTurn()) {
    more = serveNext();
    if (heldRequest_) break;
  }
  mayTake_ = false;
  countSessions();
  if (!more) {
    const std::size_t half = state_ == State::Open ? frames_.pendingBytes() : 0;
    if (!MemoryReserve::orGiveUp(MemoryReserve::Loss::Connection, [&] { countWaitingBytes(half); })) {
      cut(CutReason::OutOfMemory, outOfMemoryText);
      more = true;
    }
  }
  const auto sent = static_cast<std::int64_t>(output_.takeSentBytes() / kSentBytesPerCost);
  return {lane_.spent() + sent + std::exchange(ringCost_, 0), more};
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
  cut(CutReason::StaleFrame, [&] { return why; });
}

void SocketConnection::finishWork() {
  const LogClientScope scope(client_);
  while (!lane_.empty()) {
    lane_.beginTurn(FairShares::kQuantum);
    runLane();
  }
}

// A piece that fails has taken its request's reply along, which refused it.
void SocketConnection::runLane() {
  mayTake_ = false;
  MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [this] { host_.loop.queue()->runLane(lane_); });
}

bool SocketConnection::serveNext() {
  if (!lane_.empty()) {
    runLane();
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
      cut(CutReason::OversizeFrame, [this] {
        return "frame of " + std::to_string(frames_.announcedBytes()) + " bytes, " +
               std::to_string(frames_.maxFrameBytes()) + " are allowed";
      });
      return true;
  }
  return false;
}

void SocketConnection::serveFrame(std::span<const std::byte> frame) {
  ++host_.ledger.framesReceived;
  framesTaken_ = true;
  wire::DecodedRequest& request = host_.request;
  switch (decode(frame)) {
    case wire::DecodeVerdict::Ok:
      serveRequest(request, frame.size());
      break;
    case wire::DecodeVerdict::Refused:
      lane_.spend(costOf(request, frame.size()));
      refuseRequest(request.id, host_.refusal.code, std::move(host_.refusal.text));
      break;
    case wire::DecodeVerdict::Unreadable:
      cut(CutReason::UnreadableFrame, [this] { return "unreadable frame: " + host_.refusal.text; });
      break;
  }
}

wire::DecodeVerdict SocketConnection::decode(std::span<const std::byte> frame) {
  const MemoryReserve::Refusable refusable;
  return host_.decoder.decode(frame, host_.request, host_.refusal);
}

// The socket then yields what came before and its end, in this order.
void SocketConnection::endInput() {
  if (socket_) {
    ::shutdown(socket_.get(), SHUT_RD);
  }
}

void SocketConnection::peerEnded(bool reset) {
  const std::size_t half = frames_.pendingBytes();
  if (half != 0) {
    cut(CutReason::HalfFrame, [&] { return "ended inside a frame, " + std::to_string(half) + " bytes of it came"; });
    return;
  }
  if (reset) {
    host_.ledger.countCut(CutReason::Reset);
  }
  beginEnd(reset);
}

bool SocketConnection::countCut(CutReason reason) noexcept {
  if (state_ != State::Open) {  // it ends already
    output_.breakOff();
    return false;
  }
  host_.ledger.countCut(reason);
  return true;
}

void SocketConnection::tellCut(std::string_view line) noexcept {
  const platform::LogConditionScope condition(platform::LogCondition::ClientCut);
  const LogClientScope client(client_);
  logPrefixed(host_.log, kConnectionCategory, platform::LogLevel::Error, kModule, line);
}

void SocketConnection::tellQuota(std::string_view why) noexcept {
  const platform::LogConditionScope condition(platform::LogCondition::QuotaRefused);
  const LogClientScope client(client_);
  MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] {
    std::string line = "refused a request of " + description_ + ": ";
    line += why;
    logPrefixed(host_.log, kConnectionCategory, platform::LogLevel::Default, kModule, line);
  });
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
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, handler);
  }
  if (auto handler = std::exchange(invalidationHandler_, {})) {
    MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, handler);
  }
  object_.reset();
  rings_.reset();
  countSessions();
  --party().connections;
  // After what the handlers left to be done.
  const bool waits = MemoryReserve::orGiveUp(MemoryReserve::Loss::Work,
                                             [this] { host_.loop.queue()->asyncIn(lane_, [this] { leave(); }); });
  if (!waits) {
    leave();
  }
}

void SocketConnection::leave() noexcept {
  host_.sessions.remove(user(), number());
  host_.ends.finish(end_);
}

}  // namespace tarn::linux_host
