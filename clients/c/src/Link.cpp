// SPDX-License-Identifier: Apache-2.0
#include "clients/c/src/Link.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace tarn::reporting {

namespace {

constexpr std::size_t kLengthBytes = 4;
constexpr std::size_t kGulp = 4096;
// No reply to what this library asks is nearly as long.
constexpr std::size_t kLongestReply = 65536;

std::size_t lengthAt(const std::uint8_t* at) noexcept {
  return at[0] | std::size_t{at[1]} << 8U | std::size_t{at[2]} << 16U | std::size_t{at[3]} << 24U;
}

}  // namespace

bool Link::connect(const char* path) noexcept {
  close();  // nothing of an earlier connection is left
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (std::strlen(path) >= sizeof address.sun_path) {
    errno = ENAMETOOLONG;
    return false;
  }
  std::memcpy(address.sun_path, path, std::strlen(path));
  socket_ = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
  if (socket_ >= 0 && ::connect(socket_, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    const int why = errno;
    close();
    errno = why;
  }
  return isOpen();
}

void Link::close() noexcept {
  if (socket_ >= 0) {
    ::close(socket_);
  }
  socket_ = -1;
  out_.release();
  in_.release();
  sent_ = taken_ = attachmentCount_ = 0;
  outstanding_ = 0;
}

std::uint64_t Link::begin(Operation operation, unsigned arguments) noexcept {
  frameAt_ = out_.size();
  const std::uint8_t length[kLengthBytes] = {};
  out_.append(length, sizeof length);
  putHead(out_, Major::Array, 2 + arguments);
  putHead(out_, Major::Unsigned, nextId_);
  putHead(out_, Major::Unsigned, static_cast<std::uint64_t>(operation));
  ++outstanding_;
  return nextId_++;
}

void Link::end() noexcept {
  const std::size_t length = out_.size() - frameAt_ - kLengthBytes;
  std::uint8_t bytes[kLengthBytes];
  for (unsigned i = 0; i < kLengthBytes; ++i) {
    bytes[i] = static_cast<std::uint8_t>(length >> (8U * i));
  }
  out_.overwrite(frameAt_, bytes, sizeof bytes);
  if (out_.failed()) {
    close();  // a request is missing now: everything is said again on a new connection
  }
}

bool Link::attach(int first, int second) noexcept {
  if (attachmentCount_ == kMostAttachments) return false;
  attachments_[attachmentCount_++] = {frameAt_, {first, second}};
  return true;
}

void Link::flush() noexcept {
  while (isOpen() && hasUnsent()) {
    const long bytes = sendPart();
    if (bytes > 0) {
      sent_ += static_cast<std::size_t>(bytes);
    } else if (errno == EAGAIN) {
      return;
    } else if (errno != EINTR) {
      // What the service said last is still there to be read, and the end after it.
      ::shutdown(socket_, SHUT_WR);
      break;
    }
  }
  if (!hasUnsent()) {
    out_.clear();
    sent_ = 0;
  }
}

// Up to the next request with descriptors, or that one with them.
long Link::sendPart() noexcept {
  const bool withDescriptors = attachmentCount_ != 0 && attachments_[0].offset == sent_;
  const std::size_t next = withDescriptors ? 1 : 0;
  const std::size_t end = next < attachmentCount_ ? attachments_[next].offset : out_.size();
  iovec part{out_.data() + sent_, end - sent_};
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof attachments_[0].descriptors)] = {};
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  if (withDescriptors) {
    message.msg_control = control;
    message.msg_controllen = sizeof control;
    cmsghdr* const header = CMSG_FIRSTHDR(&message);
    header->cmsg_level = SOL_SOCKET;
    header->cmsg_type = SCM_RIGHTS;
    header->cmsg_len = CMSG_LEN(sizeof attachments_[0].descriptors);
    std::memcpy(CMSG_DATA(header), attachments_[0].descriptors, sizeof attachments_[0].descriptors);
  }
  const ssize_t bytes = ::sendmsg(socket_, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
  if (bytes > 0 && withDescriptors) {
    --attachmentCount_;
    std::memmove(attachments_, attachments_ + 1, attachmentCount_ * sizeof attachments_[0]);
  }
  return bytes;
}

bool Link::receiveSome() noexcept {
  std::uint8_t* const room = in_.room(kGulp);
  if (room == nullptr) {
    close();
    return false;
  }
  const ssize_t bytes = ::recv(socket_, room, kGulp, MSG_DONTWAIT);
  if (bytes > 0) {
    in_.grow(static_cast<std::size_t>(bytes));
    return true;
  }
  if (bytes == 0 || (errno != EAGAIN && errno != EINTR)) {
    close();
  }
  return false;
}

bool Link::nextReply(ReplyFront& reply) noexcept {
  const std::size_t left = in_.size() - taken_;
  if (!isOpen() || left < kLengthBytes) return false;
  const std::uint8_t* const at = in_.data() + taken_;
  const std::size_t length = lengthAt(at);
  if (length > kLongestReply) {
    close();
    return false;
  }
  if (left - kLengthBytes < length) return false;
  taken_ += kLengthBytes + length;
  reply = ReplyFront{};
  if (!readReplyFront(at + kLengthBytes, length, reply)) {
    close();
    return false;
  }
  return true;
}

void Link::dropTaken() noexcept {
  if (taken_ != 0) {
    in_.dropFront(taken_);
    taken_ = 0;
  }
}

}  // namespace tarn::reporting
