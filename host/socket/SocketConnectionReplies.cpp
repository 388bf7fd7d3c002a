// SPDX-License-Identifier: Apache-2.0
// The replies of SocketConnection: how they are encoded, gathered and sent.
#include <sys/epoll.h>

#include <algorithm>
#include <new>
#include <utility>

#include "host/socket/SocketConnection.h"
#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

// Replies that are sent before the turn's end, so that a gulp of small requests doesn't pile up large replies.
constexpr std::size_t kEarlyFlushBytes = 262144;
// While a client has more requests to be served, its replies are gathered up to so many bytes and for so many turns.
constexpr std::size_t kGatheredReplyBytes = 4096;
constexpr int kMostFlushesPutOff = 8;
// Bytes that are sent at once: the rest goes out after others have had their turn.
constexpr std::size_t kSentAtOnce = 65536;
// Numbers of a reply that are encoded at once, and in a unit of cost.
constexpr std::size_t kNumbersAtOnce = 2048;
constexpr std::size_t kNumbersPerCost = 128;

}  // namespace

template <class Content>
void SocketConnection::reply(std::uint64_t id, Content& content) noexcept {
  if ((state_ != State::Open && state_ != State::Ending) || output_.broken()) {
    output_.countDropped();
    return;
  }
  try {
    output_.append(id, content);
  } catch (const std::bad_alloc&) {
    replyShortly(id);
    return;
  }
  flushSoon();
}

void SocketConnection::refuseRequest(std::uint64_t id, wire::ErrorCode code, std::string why) noexcept {
  if (code == wire::ErrorCode::OutOfMemory) {
    MemoryReserve::count(MemoryReserve::Loss::Request);
  }
  lane_.spend(1);
  host_.ledger.countRefusal(code);
  if (code == wire::ErrorCode::OverQuota && !std::exchange(quotaTold_, true)) {
    tellQuota(why);
  }
  const platform::RemoteError error{wire::kErrorDomain, static_cast<std::int64_t>(code), std::move(why)};
  reply(id, error);
}

void SocketConnection::refuseForMemory(std::uint64_t id) noexcept {
  refuseRequest(id, wire::ErrorCode::OutOfMemory, outOfMemoryText());
}

// In the place of a reply that is too large for the memory that there is: an error, and without the memory for that the
// connection's end.
void SocketConnection::replyShortly(std::uint64_t id) noexcept {
  const bool appended = MemoryReserve::orGiveUp(MemoryReserve::Loss::Connection, [&] {
    const platform::RemoteError error{wire::kErrorDomain, static_cast<std::int64_t>(wire::ErrorCode::OutOfMemory),
                                      outOfMemoryText()};
    output_.append(id, error);
  });
  if (!appended) {
    output_.countDropped();
    cut(CutReason::OutOfMemory, outOfMemoryText);
  } else {
    MemoryReserve::count(MemoryReserve::Loss::Request);
    host_.ledger.countRefusal(wire::ErrorCode::OutOfMemory);
    flushSoon();
  }
}

// After a reply was appended.
void SocketConnection::flushSoon() noexcept {
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
void SocketConnection::sendRest(NumbersReply numbers) noexcept {
  const std::uint64_t id = numbers.id();
  try {
    numbers.encode(kNumbersAtOnce);
    if (numbers.whole()) {
      reply(id, numbers);
      return;
    }
    lane_.spend(kNumbersAtOnce / kNumbersPerCost);
    host_.loop.queue()->asyncIn(lane_, [this, rest = std::move(numbers)]() mutable { sendRest(std::move(rest)); });
  } catch (const std::bad_alloc&) {
    refuseForMemory(id);
    return;
  }
  if (WorkLane::currentOf(host_.loop.queue().get()) != &lane_) {
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

// What is beyond the bound is sent at any rate: only what the system doesn't take was left unread. Nothing comes after
// the connection's last flush, nor after the process's.
std::size_t SocketConnection::sentAtOnce() const noexcept {
  if (state_ != State::Open || !host_.gathersReplies) return ReplyOutput::kEverything;
  const std::size_t bound = host_.limits.maxUnreadReplyBytes;
  return std::max(kSentAtOnce, output_.unsentBytes() - std::min(output_.unsentBytes(), bound));
}

void SocketConnection::flush() {
  const LogClientScope scope(client_);
  flushAsked_ = gathersReplies();
  if (flushAsked_) {
    host_.loop.flushLater(shared_from_this());
    return;
  }
  if (!socket_ || !output_.sendSome(socket_.get(), sentAtOnce())) return;
  const std::size_t unsent = output_.unsentBytes();
  if (state_ != State::Open) {
    if (unsent > host_.limits.maxUnreadReplyBytes) {
      output_.breakOff();
    }
  } else if (unsent > host_.limits.maxUnreadReplyBytes) {
    cut(CutReason::UnreadReplies, [&] { return std::to_string(unsent) + " bytes of replies left unread"; });
  } else if (output_.stalled()) {
    watch(watchedEvents_ | EPOLLOUT);
  } else {
    if ((watchedEvents_ & EPOLLOUT) != 0) {
      watch(watchedEvents_ & ~std::uint32_t{EPOLLOUT});
    }
    if (unsent != 0) {
      flushAsked_ = true;
      host_.loop.flushLater(shared_from_this());
    }
  }
}

}  // namespace tarn::linux_host
