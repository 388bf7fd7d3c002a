#include "host/socket/ReplyOutput.h"

#include <sys/socket.h>

#include <cerrno>
#include <utility>

#include "host/socket/Ledger.h"
#include "host/socket/NumbersReply.h"
#include "wire/Encoder.h"

namespace tarn::linux_host {

namespace {

// Room that a connection keeps while it is quiet.
constexpr std::size_t kKeptBytes = 65536;

}  // namespace

template <class Encode>
void ReplyOutput::appendWhole(const Encode& encode) {
  const std::size_t before = bytes_.size();
  try {
    wire::Encoder encoder(bytes_);
    encode(encoder);
  } catch (...) {
    bytes_.resize(before);
    throw;
  }
  ++unsentReplies_;
}

void ReplyOutput::append(std::uint64_t id, std::initializer_list<plist::ValueView> results) {
  appendWhole([&](wire::Encoder& encoder) { encoder.reply(id, results); });
}

void ReplyOutput::append(std::uint64_t id, const NumbersReply& reply) {
  appendWhole([&](wire::Encoder& encoder) { encoder.replyWithNumbers(id, reply.count(), reply.encoded()); });
}

void ReplyOutput::append(std::uint64_t id, const platform::RemoteError& error) {
  appendWhole([&](wire::Encoder& encoder) { encoder.errorReply(id, error.domain, error.code, error.text); });
}

void ReplyOutput::countDropped() noexcept {
  ++ledger_.repliesDropped;
}

bool ReplyOutput::sendSome(int socket) {
  while (unsentBytes() != 0) {
    const ssize_t bytes = ::send(socket, bytes_.data() + sentBytes_, unsentBytes(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (bytes >= 0) {
      sentBytes_ += static_cast<std::size_t>(bytes);
    } else if (errno == EAGAIN) {
      if (sentBytes_ > bytes_.size() / 2) {
        bytes_.erase(0, std::exchange(sentBytes_, 0));
      }
      return true;
    } else if (errno != EINTR) {
      resetSeen_ = errno == ECONNRESET;
      breakOff();
      return false;
    }
  }
  ledger_.repliesSent += std::exchange(unsentReplies_, 0);
  drop();
  return true;
}

void ReplyOutput::drop() noexcept {
  ledger_.repliesDropped += std::exchange(unsentReplies_, 0);
  sentBytes_ = 0;
  if (bytes_.capacity() > kKeptBytes) {
    bytes_ = std::string();
  } else {
    bytes_.clear();
  }
}

void ReplyOutput::breakOff() noexcept {
  broken_ = true;
  drop();
}

}  // namespace tarn::linux_host
