// SPDX-License-Identifier: Apache-2.0
#include "host/socket/ReplyOutput.h"

#include <sys/socket.h>

#include <algorithm>
#include <cerrno>

#include "host/socket/Ledger.h"
#include "host/socket/NumbersReply.h"
#include "wire/Encoder.h"

namespace tarn::linux_host {

namespace {

// A text that has so many bytes gets no further reply.
constexpr std::size_t kTextBytes = 32768;
// Room that a connection keeps while it is quiet.
constexpr std::size_t kKeptBytes = 65536;

}  // namespace

template <class Encode>
void ReplyOutput::appendWhole(const Encode& encode) {
  if (texts_.empty() || texts_.back().size() >= kTextBytes) {
    texts_.emplace_back();
  }
  std::string& text = texts_.back();
  const std::size_t before = text.size();
  try {
    wire::Encoder encoder(text);
    encode(encoder);
  } catch (...) {
    text.resize(before);
    throw;
  }
  unsentBytes_ += text.size() - before;
  ++unsentReplies_;
}

void ReplyOutput::append(std::uint64_t id, std::initializer_list<plist::ValueView> results) {
  appendWhole([&](wire::Encoder& encoder) { encoder.reply(id, results); });
}

void ReplyOutput::append(std::uint64_t id, const platform::RemoteError& error) {
  appendWhole([&](wire::Encoder& encoder) { encoder.errorReply(id, error.domain, error.code, error.text); });
}

void ReplyOutput::append(std::uint64_t id, NumbersReply& reply) {
  appendWhole([&](wire::Encoder& encoder) { encoder.replyWithNumbers(id, reply.count(), reply.bytes()); });
  texts_.splice(texts_.end(), reply.encoded());
  unsentBytes_ += reply.bytes();
}

void ReplyOutput::countDropped() noexcept {
  ++ledger_.repliesDropped;
}

bool ReplyOutput::sendSome(int socket, std::size_t most) {
  stalled_ = false;
  for (std::size_t left = most; unsentBytes_ != 0 && left != 0;) {
    const std::string& first = texts_.front();
    const std::size_t size = std::min(left, first.size() - sentOfFirst_);
    const ssize_t bytes = ::send(socket, first.data() + sentOfFirst_, size, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (bytes >= 0) {
      take(static_cast<std::size_t>(bytes));
      left -= static_cast<std::size_t>(bytes);
    } else if (errno == EAGAIN) {
      stalled_ = true;
      return true;
    } else if (errno != EINTR) {
      resetSeen_ = errno == ECONNRESET;
      breakOff();
      return false;
    }
  }
  if (unsentBytes_ == 0) {
    ledger_.repliesSent += std::exchange(unsentReplies_, 0);
    drop();
  }
  return true;
}

void ReplyOutput::take(std::size_t bytes) noexcept {
  sentBytes_ += bytes;
  unsentBytes_ -= bytes;
  sentOfFirst_ += bytes;
  if (sentOfFirst_ == texts_.front().size() && texts_.size() > 1) {
    texts_.pop_front();
    sentOfFirst_ = 0;
  }
}

void ReplyOutput::drop() noexcept {
  ledger_.repliesDropped += std::exchange(unsentReplies_, 0);
  unsentBytes_ = 0;
  sentOfFirst_ = 0;
  while (texts_.size() > 1) {
    texts_.pop_front();
  }
  if (texts_.empty()) return;
  if (texts_.front().capacity() > kKeptBytes) {
    texts_.clear();
  } else {
    texts_.front().clear();
  }
}

void ReplyOutput::breakOff() noexcept {
  broken_ = true;
  drop();
}

}  // namespace tarn::linux_host
