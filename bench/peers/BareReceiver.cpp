// SPDX-License-Identifier: Apache-2.0
#include "bench/peers/BareReceiver.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>

#include "bench/Message.h"
#include "wire/Encoder.h"

namespace tarn::bench {

namespace {

constexpr std::size_t kGulpBytes = 65536;

std::string makeReply() {
  std::string reply;
  wire::Encoder(reply).reply(123'456);
  return reply;
}

}  // namespace

BareReceiver::BareReceiver(Writes writes, BareTurn turn)
    : writes_(writes),
      child_([this, turn] { serve(turn, ends_.theirs); }),
      frame_(makeFrame(1)),
      received_(kGulpBytes, '\0') {
  ::close(ends_.theirs);
}

BareReceiver::~BareReceiver() {
  ::close(ends_.ours);
}

// Takes replies in while the peer takes nothing, as both would wait for ever otherwise.
void BareReceiver::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(ends_.ours, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (sent > 0) {
      bytes.remove_prefix(static_cast<std::size_t>(sent));
    } else if (errno == EAGAIN) {
      receiveReplies();
    } else {
      fail("the bare peer went away");
    }
  }
}

// Waits for at least one byte, and counts the replies that came to their end.
void BareReceiver::receiveReplies() {
  static const std::size_t kReplyBytes = makeReply().size();
  const ssize_t bytes = ::recv(ends_.ours, received_.data(), received_.size(), 0);
  if (bytes <= 0) {
    fail("the bare peer went away");
  }
  pendingBytes_ += static_cast<std::size_t>(bytes);
  replies_ += pendingBytes_ / kReplyBytes;
  pendingBytes_ %= kReplyBytes;
}

void BareReceiver::roundTrip() {
  replies_ = 0;
  send(frame_);
  while (replies_ == 0) {
    receiveReplies();
  }
}

void BareReceiver::stream(std::size_t count, std::size_t outstanding) {
  replies_ = 0;
  std::size_t sent = 0;
  while (replies_ < count) {
    for (; sent < count && sent - replies_ < outstanding; ++sent) {
      gathered_ += frame_;
      if (writes_ == Writes::OneEach || gathered_.size() >= kGulpBytes) {
        send(gathered_);
        gathered_.clear();
      }
    }
    send(gathered_);
    gathered_.clear();
    receiveReplies();
  }
}

}  // namespace tarn::bench
