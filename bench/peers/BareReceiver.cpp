// SPDX-License-Identifier: Apache-2.0
#include "bench/peers/BareReceiver.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

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

void sendAll(int socket, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent <= 0) {
      std::_Exit(EXIT_FAILURE);
    }
    bytes.remove_prefix(static_cast<std::size_t>(sent));
  }
}

// The whole frames at the front of the bytes: how many, and where they end.
std::size_t countFrames(std::string_view bytes, std::size_t& end) {
  std::size_t frames = 0;
  end = 0;
  while (bytes.size() - end >= wire::kFrameHeaderBytes) {
    std::uint32_t length = 0;
    std::memcpy(&length, bytes.data() + end, sizeof length);
    if (bytes.size() - end - wire::kFrameHeaderBytes < length) break;
    end += wire::kFrameHeaderBytes + length;
    ++frames;
  }
  return frames;
}

void serve(int socket) {
  const std::string reply = makeReply();
  std::string input(2 * kGulpBytes, '\0');
  std::string replies;
  std::size_t pending = 0;
  for (;;) {
    const ssize_t received = ::recv(socket, input.data() + pending, kGulpBytes, 0);
    if (received <= 0) return;
    pending += static_cast<std::size_t>(received);
    std::size_t end = 0;
    const std::size_t frames = countFrames(std::string_view(input).substr(0, pending), end);
    std::memmove(input.data(), input.data() + end, pending - end);
    pending -= end;
    replies.clear();
    for (std::size_t i = 0; i < frames; ++i) {
      replies += reply;
    }
    sendAll(socket, replies);
  }
}

}  // namespace

BareReceiver::BareReceiver(Writes writes)
    : writes_(writes), child_([this] { serve(ends_.theirs); }), frame_(makeFrame(1)), received_(kGulpBytes, '\0') {
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
