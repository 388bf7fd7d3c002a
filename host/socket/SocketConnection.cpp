#include "host/socket/SocketConnection.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>

#include "host/log/LogFloodGuard.h"
#include "host/log/PrefixedLog.h"
#include "wire/Encoder.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "SocketConnection";
// Replies that are sent before the turn's end, so that a gulp of small requests doesn't pile up large replies.
constexpr std::size_t kEarlyFlushBytes = 262144;
// Room for replies that a connection keeps while it is quiet.
constexpr std::size_t kKeptOutputBytes = 65536;

}  // namespace

SocketConnection::SocketConnection(ConnectionHost& host, UniqueDescriptor socket, std::uint64_t number)
    : host_(host), socket_(std::move(socket)), client_{.connection = number}, frames_(host.limits.maxFrameBytes) {
  ucred peer{};
  socklen_t size = sizeof peer;
  if (::getsockopt(socket_.get(), SOL_SOCKET, SO_PEERCRED, &peer, &size) == 0) {
    client_.process = peer.pid;
    client_.user = peer.uid;
  }
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
  watch(EPOLLIN);
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
  if (!heldRequest_) {
    receive();
  } else if ((events & (EPOLLHUP | EPOLLERR)) != 0) {
    // The peer is gone. That keeps until the request that it left behind could be served.
    dropOutput();
    outputBroken_ = true;
    watch(0);
  } else {
    watch(watchedEvents_ & ~std::uint32_t{EPOLLIN});
  }
}

void SocketConnection::receive() {
  const auto space = frames_.space();
  const auto size = std::min(space.size(), host_.limits.gulpBytes);
  const ssize_t bytes = ::recv(socket_.get(), space.data(), size, MSG_DONTWAIT);
  if (bytes > 0) {
    frames_.received(static_cast<std::size_t>(bytes));
    serveFrames();
  } else if (bytes == 0) {
    peerEnded(resetSeen_);
  } else if (errno != EAGAIN && errno != EINTR) {
    peerEnded(true);
  }
}

void SocketConnection::serveFrames() {
  std::span<const std::byte> frame;
  while (state_ == State::Open && !heldRequest_) {
    switch (frames_.next(frame)) {
      case wire::FrameBuffer::Next::Frame:
        serveFrame(frame);
        break;
      case wire::FrameBuffer::Next::Incomplete:
        if (frames_.pendingBytes() == 0 && host_.ledger.connectionsOpen > host_.limits.keptBuffers) {
          frames_.release();
        }
        return;
      case wire::FrameBuffer::Next::Oversize:
        cut(CutReason::OversizeFrame, "frame of " + std::to_string(frames_.announcedBytes()) + " bytes, " +
                                          std::to_string(host_.limits.maxFrameBytes) + " are allowed");
        return;
    }
  }
}

void SocketConnection::serveFrame(std::span<const std::byte> frame) {
  ++host_.ledger.framesReceived;
  wire::DecodedRequest& request = host_.request;
  switch (host_.decoder.decode(frame, request, host_.refusal)) {
    case wire::DecodeVerdict::Ok:
      serveRequest(request);
      break;
    case wire::DecodeVerdict::Refused:
      host_.ledger.countRefusal(host_.refusal.code);
      sendError(request.id, {wire::kErrorDomain, static_cast<std::int64_t>(host_.refusal.code), host_.refusal.text});
      break;
    case wire::DecodeVerdict::Unreadable:
      cut(CutReason::UnreadableFrame, "unreadable frame: " + host_.refusal.text);
      break;
  }
}

void SocketConnection::serveRequest(wire::DecodedRequest& request) {
  if (request.operation == wire::Operation::Status) {
    // At once: whoever asks how the service is must not wait for its work.
    sendReply(request.id, {host_.status()});
  } else if (!host_.gate.open()) {
    heldRequest_ = std::move(request);
    host_.gate.hold(shared_from_this());
  } else {
    if (request.operation == wire::Operation::SendMessage) {
      ++host_.ledger.messagesReceived;
    }
    dispatchRequest(request, *object_, weak_from_this());
  }
}

void SocketConnection::serveHeldRequest() {
  const LogClientScope scope(client_);
  if (state_ != State::Open || !heldRequest_) return;
  wire::DecodedRequest request = std::move(*heldRequest_);
  heldRequest_.reset();
  serveRequest(request);
  serveFrames();
  if (state_ == State::Open && !heldRequest_) {
    watch(watchedEvents_ | EPOLLIN);
  }
}

// The socket then yields what came before and its end, in this order.
void SocketConnection::endInput() {
  if (socket_) {
    ::shutdown(socket_.get(), SHUT_RD);
  }
}

bool SocketConnection::takesReplies() noexcept {
  if ((state_ == State::Open || state_ == State::Ending) && !outputBroken_) return true;
  ++host_.ledger.repliesDropped;
  return false;
}

void SocketConnection::sendReply(std::uint64_t id, std::initializer_list<plist::ValueView> results) {
  if (takesReplies()) {
    wire::Encoder(output_).reply(id, results);
    replyAppended();
  }
}

void SocketConnection::sendNumbers(std::uint64_t id, std::span<const std::int64_t> numbers) {
  if (takesReplies()) {
    wire::Encoder(output_).replyWithNumbers(id, numbers);
    replyAppended();
  }
}

void SocketConnection::sendError(std::uint64_t id, const platform::RemoteError& error) {
  if (takesReplies()) {
    wire::Encoder(output_).errorReply(id, error.domain, error.code, error.text);
    replyAppended();
  }
}

void SocketConnection::replyAppended() {
  ++unsentReplies_;
  const bool waitsForRoom = (watchedEvents_ & EPOLLOUT) != 0;
  if (unsentBytes() > (waitsForRoom ? host_.limits.maxUnreadReplyBytes : kEarlyFlushBytes)) {
    flush();
  } else if (!waitsForRoom && !flushAsked_) {
    flushAsked_ = true;
    host_.loop.flushLater(shared_from_this());
  }
}

void SocketConnection::flush() {
  const LogClientScope scope(client_);
  flushAsked_ = false;
  if (!socket_ || !sendSome()) return;
  if (unsentBytes() == 0) {
    host_.ledger.repliesSent += std::exchange(unsentReplies_, 0);
    dropOutput();
  } else if (sentBytes_ > output_.size() / 2) {
    output_.erase(0, std::exchange(sentBytes_, 0));
  }
  if (state_ != State::Open) {
    if (unsentBytes() > host_.limits.maxUnreadReplyBytes) {
      outputBroken_ = true;
      dropOutput();
    }
    return;
  }
  if (unsentBytes() > host_.limits.maxUnreadReplyBytes) {
    cut(CutReason::UnreadReplies, std::to_string(unsentBytes()) + " bytes of replies left unread");
  } else if (unsentBytes() != 0) {
    watch(watchedEvents_ | EPOLLOUT);
  } else {
    watch(watchedEvents_ & ~std::uint32_t{EPOLLOUT});
  }
}

// Sends what the system takes now. False when the peer will never take any more.
bool SocketConnection::sendSome() {
  while (unsentBytes() != 0) {
    const ssize_t bytes =
        ::send(socket_.get(), output_.data() + sentBytes_, unsentBytes(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (bytes >= 0) {
      sentBytes_ += static_cast<std::size_t>(bytes);
    } else if (errno == EAGAIN) {
      return true;
    } else if (errno != EINTR) {
      // What the peer sent before is still there to be read, and its end behind that.
      resetSeen_ = errno == ECONNRESET;
      outputBroken_ = true;
      dropOutput();
      return false;
    }
  }
  return true;
}

void SocketConnection::dropOutput() noexcept {
  host_.ledger.repliesDropped += std::exchange(unsentReplies_, 0);
  sentBytes_ = 0;
  if (output_.capacity() > kKeptOutputBytes) {
    output_ = std::string();
  } else {
    output_.clear();
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
  heldRequest_.reset();
  const auto self = shared_from_this();
  watch(0);
  if (interrupted) {
    dropOutput();
    socket_.reset();
  }
  host_.loop.queue()->async([self, interrupted] { self->finish(interrupted); });
}

void SocketConnection::finish(bool interrupted) {
  flush();
  dropOutput();
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
}

}  // namespace tarn::linux_host
