// SPDX-License-Identifier: Apache-2.0
#include "client/ClientConnection.h"

#include <algorithm>
#include <utility>

#include "wire/Encoder.h"

namespace tarn::client {

static_assert(Options().maxFrameBytes == wire::kDefaultMaxFrameBytes);

ClientConnection::Connected ClientConnection::connect(const std::string& path, const Options& options) {
  Result<Socket> socket = Socket::connect(path, options.timeout);
  if (socket.failed()) return {nullptr, std::move(socket.error)};
  return {std::make_unique<ClientConnection>(std::move(socket.value), options), {}};
}

ClientConnection::Connected ClientConnection::connect(const std::string& path) {
  Options options;
  options.timeout = std::chrono::minutes(1);
  return connect(path, options);
}

ClientConnection::ClientConnection(Socket socket, const Options& options)
    : options_(options), socket_(std::move(socket)), frames_(options.maxReplyBytes) {
  socket_.limitReceiving(options_.timeout);
}

ClientConnection::~ClientConnection() {
  flush();
  close();
}

void ClientConnection::setLostHandler(LostHandler handler) {
  const OwnerCheck::Use use(owner_);
  if (use.granted()) {
    lostHandler_ = std::move(handler);
  }
}

Reply ClientConnection::call(const Request& request, std::optional<Milliseconds> timeout) {
  const OwnerCheck::Use use(owner_);
  if (!use.granted() || delivering_) return misuse();
  const Deadline deadline = deadlineAfter(timeout);
  std::optional<Reply> answer;
  ReplyHandler handler = [&answer](Reply&& reply) { answer = std::move(reply); };
  const SendStatus status = sendWithRoom(request, handler, deadline);
  if (status != SendStatus::Sent) return notSent(status);
  const std::uint64_t id = nextID_ - 1;
  deliverLeftOvers();
  if (!answer && !timeout) {
    receiveAtOnce();
  }
  while (!answer) {
    if (Clock::now() >= deadline) {
      pending_.forget(id);
      return failure(Outcome::TimedOut, "no reply in time");
    }
    exchange(deadline);
  }
  return std::move(*answer);
}

SendStatus ClientConnection::send(const Request& request, ReplyHandler handler) {
  const OwnerCheck::Use use(owner_);
  if (!use.granted()) return SendStatus::Misuse;
  const SendStatus status = sendWithRoom(request, handler, deadlineAfter(std::nullopt));
  if (status == SendStatus::Sent && outgoing_.size() - written_ >= options_.autoFlushBytes) {
    writeSome();
  }
  return status;
}

SendStatus ClientConnection::trySend(const Request& request, ReplyHandler handler) {
  const OwnerCheck::Use use(owner_);
  if (!use.granted()) return SendStatus::Misuse;
  SendStatus status = append(request, handler);
  if (status == SendStatus::Full && wantsToWrite()) {
    writeSome();
    status = append(request, handler);
  }
  if (status == SendStatus::Sent && outgoing_.size() - written_ >= options_.autoFlushBytes) {
    writeSome();
  }
  return status;
}

bool ClientConnection::flush(std::optional<Milliseconds> timeout) {
  const OwnerCheck::Use use(owner_);
  return use.granted() && !delivering_ && flushUntil(deadlineAfter(timeout));
}

bool ClientConnection::flushUntil(Deadline deadline) {
  writeSome();
  while (wantsToWrite() && Clock::now() < deadline) {
    exchange(deadline);
  }
  return connected() && !writeBroken_ && !wantsToWrite();
}

std::size_t ClientConnection::dispatch() {
  return wait(Milliseconds(0));
}

std::size_t ClientConnection::wait(Milliseconds timeout) {
  const OwnerCheck::Use use(owner_);
  if (!use.granted() || delivering_) return 0;
  const std::size_t before = delivered_;
  deliverLeftOvers();
  if (delivered_ == before) {
    exchange(Clock::now() + timeout);
  }
  return delivered_ - before;
}

void ClientConnection::close() {
  const OwnerCheck::Use use(owner_);
  if (!use.granted()) return;
  socket_.close();
  outgoing_.clear();
  written_ = 0;
  ending_ = Ending::Closed;
  if (!delivering_) {
    deliverLeftOvers();
  }
}

ClientConnection::Deadline ClientConnection::deadlineAfter(std::optional<Milliseconds> timeout) const {
  return Clock::now() + timeout.value_or(options_.timeout);
}

// Sends, waiting for room where that is allowed and can come.
SendStatus ClientConnection::sendWithRoom(const Request& request, ReplyHandler& handler, Deadline deadline) {
  SendStatus status = append(request, handler);
  const bool isStart = request.operation == wire::Operation::StartReportingSessionForID;
  while (status == SendStatus::Full && !delivering_ && !(isStart && countsAreFull(request)) &&
         Clock::now() < deadline) {
    exchange(deadline);
    status = append(request, handler);
  }
  return status;
}

bool ClientConnection::countsAreFull(const Request& request) const noexcept {
  return request.operation == wire::Operation::StartReportingSessionForID
             ? pending_.heldCount() >= options_.maxOutstanding
             : pending_.waitingCount() >= options_.maxOutstanding;
}

// Puts the request in line or leaves everything, the handler too, as it was.
SendStatus ClientConnection::append(const Request& request, ReplyHandler& handler) {
  if (!connected() || writeBroken_) return SendStatus::NotConnected;
  if (countsAreFull(request)) return SendStatus::Full;
  const std::size_t before = outgoing_.size();
  wire::Encoder(outgoing_).request(nextID_, request);
  const bool tooLarge = outgoing_.size() - before - wire::kFrameHeaderBytes > options_.maxFrameBytes;
  if (tooLarge || (wantsToWrite() && before > written_ && outgoing_.size() - written_ > options_.maxOutgoingBytes)) {
    outgoing_.resize(before);
    return tooLarge ? SendStatus::TooLarge : SendStatus::Full;
  }
  pending_.add(nextID_++, request, std::move(handler));
  return SendStatus::Sent;
}

void ClientConnection::writeSome() {
  while (wantsToWrite() && connected()) {
    const std::ptrdiff_t sent = socket_.sendSome(std::string_view(outgoing_).substr(written_));
    if (sent < 0) {
      writeBroken_ = true;
      written_ = outgoing_.size();
    } else if (sent == 0) {
      break;
    } else {
      written_ += static_cast<std::size_t>(sent);
    }
  }
  if (written_ * 2 >= outgoing_.size()) {
    outgoing_.erase(0, written_);
    written_ = 0;
  }
}

void ClientConnection::readSome(bool mayWait) {
  while (connected()) {
    const std::span<std::byte> space = frames_.space();
    const std::ptrdiff_t received = socket_.receiveSome(space, mayWait);
    if (received < 0) {
      lose("the service ended the connection");
      return;
    }
    frames_.received(static_cast<std::size_t>(received));
    takeFrames();
    if (static_cast<std::size_t>(received) < space.size()) return;
    mayWait = false;
  }
}

void ClientConnection::takeFrames() {
  std::span<const std::byte> frame;
  wire::DecodedReply decoded;
  while (connected()) {
    switch (frames_.next(frame)) {
      case wire::FrameBuffer::Next::Incomplete:
        return;
      case wire::FrameBuffer::Next::Oversize:
        lose("a reply of " + std::to_string(frames_.announcedBytes()) + " bytes is too long");
        return;
      case wire::FrameBuffer::Next::Frame:
        break;
    }
    if (const Status read = decoder_.decode(frame, decoded); read.failed()) {
      lose("an unreadable reply: " + read->text);
      return;
    }
    takeReply(decoded);
  }
}

void ClientConnection::takeReply(wire::DecodedReply& decoded) {
  ReplyHandler handler;
  if (!pending_.take(decoded.id, decoded.error.has_value(), handler)) {
    ++unmatchedReplies_;
    return;
  }
  Reply reply;
  if (decoded.error) {
    reply.outcome = Outcome::Error;
    reply.error = std::move(*decoded.error);
  }
  reply.results = std::move(decoded.results);
  deliver(handler, std::move(reply));
  deliverCancelled();
}

// One round: write what can be, wait, read what is there, deliver.
void ClientConnection::exchange(Deadline deadline) {
  writeSome();
  if (connected()) {
    const auto left = std::max(Milliseconds(0), std::chrono::ceil<Milliseconds>(deadline - Clock::now()));
    if (left == Milliseconds(0) || socket_.waitUntilReady(wantsToWrite(), left)) {
      writeSome();
      readSome(false);
    }
  }
  deliverLeftOvers();
}

// The same where the whole time is left: the socket itself keeps it, which saves asking whether there is something.
void ClientConnection::receiveAtOnce() {
  writeSome();
  if (connected() && !wantsToWrite()) {
    readSome(true);
  }
  deliverLeftOvers();
}

void ClientConnection::deliver(const ReplyHandler& handler, Reply&& reply) {
  if (!handler) return;
  delivering_ = true;
  handler(std::move(reply));
  delivering_ = false;
  ++delivered_;
}

void ClientConnection::deliverCancelled() {
  ReplyHandler handler;
  while (pending_.takeCancelled(handler)) {
    deliver(handler, failure(Outcome::Cancelled, "the reply can never come"));
  }
}

// What became certain without a reply: starts that are never answered, and the end of the connection.
void ClientConnection::deliverLeftOvers() {
  deliverCancelled();
  if (ending_ == Ending::None) return;
  const bool lost = std::exchange(ending_, Ending::None) == Ending::Lost;
  for (PendingReplies::Rest& rest : pending_.takeAll()) {
    if (rest.killedService && lost) {
      deliver(rest.handler, Reply());
    } else {
      deliver(rest.handler, lost ? failure(Outcome::ConnectionLost, lostWhy_)
                                 : failure(Outcome::Cancelled, "the client closed the connection"));
    }
  }
  if (lost && lostHandler_) {
    delivering_ = true;
    lostHandler_(lostWhy_);
    delivering_ = false;
  }
}

// The handlers hear of it in deliverLeftOvers, when no other handler is running.
void ClientConnection::lose(std::string why) {
  socket_.close();
  outgoing_.clear();
  written_ = 0;
  ending_ = Ending::Lost;
  lostWhy_ = std::move(why);
}

}  // namespace tarn::client
