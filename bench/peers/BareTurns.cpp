// SPDX-License-Identifier: Apache-2.0
#include "bench/peers/BareTurns.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "bench/Message.h"
#include "wire/Encoder.h"

#ifdef TARN_HAVE_LIBURING
#include <liburing.h>
#endif

namespace tarn::bench {

namespace {

constexpr std::size_t kGulpBytes = 65536;

// What came, and what answers it.
class Frames {
 public:
  Frames() { wire::Encoder(reply_).reply(123'456); }

  // Where the next gulp goes.
  char* room() { return input_.data() + pending_; }
  // Takes so many bytes of it; the replies of the frames that are whole now. They live until the next call.
  std::string_view take(std::size_t bytes) {
    pending_ += bytes;
    replies_.clear();
    std::size_t at = 0;
    while (pending_ - at >= wire::kFrameHeaderBytes) {
      std::uint32_t length = 0;
      std::memcpy(&length, input_.data() + at, sizeof length);
      if (pending_ - at - wire::kFrameHeaderBytes < length) break;
      at += wire::kFrameHeaderBytes + length;
      replies_ += reply_;
    }
    std::memmove(input_.data(), input_.data() + at, pending_ - at);
    pending_ -= at;
    return replies_;
  }

 private:
  std::string reply_;
  std::string input_ = std::string(2 * kGulpBytes, '\0');
  std::string replies_;
  std::size_t pending_ = 0;
};

void sendAll(int socket, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent <= 0) {
      std::_Exit(EXIT_FAILURE);
    }
    bytes.remove_prefix(static_cast<std::size_t>(sent));
  }
}

void serveByReceiving(int socket) {
  Frames frames;
  for (;;) {
    const ssize_t received = ::recv(socket, frames.room(), kGulpBytes, 0);
    if (received <= 0) return;
    sendAll(socket, frames.take(static_cast<std::size_t>(received)));
  }
}

void serveByEpoll(int socket) {
  Frames frames;
  const int poll = ::epoll_create1(EPOLL_CLOEXEC);
  epoll_event event{};
  event.events = EPOLLIN;
  if (::epoll_ctl(poll, EPOLL_CTL_ADD, socket, &event) != 0) {
    std::_Exit(EXIT_FAILURE);
  }
  while (::epoll_wait(poll, &event, 1, -1) == 1) {
    const ssize_t received = ::recv(socket, frames.room(), kGulpBytes, MSG_DONTWAIT);
    if (received <= 0) return;
    sendAll(socket, frames.take(static_cast<std::size_t>(received)));
  }
}

#ifdef TARN_HAVE_LIBURING
// The set-up that gains most: one thread, which does the kernel's part of the work when it waits.
bool setUp(io_uring& ring) {
  return ::io_uring_queue_init(8, &ring, IORING_SETUP_SINGLE_ISSUER | IORING_SETUP_DEFER_TASKRUN) == 0;
}

void serveByRing(int socket) {
  enum : std::uint64_t { kReceived, kSent };
  io_uring ring{};
  if (!setUp(ring)) {
    std::_Exit(EXIT_FAILURE);
  }
  Frames frames;
  std::string_view replies;
  for (;;) {
    unsigned awaited = 1;
    if (!replies.empty()) {
      io_uring_sqe* const send = ::io_uring_get_sqe(&ring);
      ::io_uring_prep_send(send, socket, replies.data(), replies.size(), MSG_NOSIGNAL | MSG_WAITALL);
      send->user_data = kSent;
      ++awaited;
    }
    io_uring_sqe* const receive = ::io_uring_get_sqe(&ring);
    ::io_uring_prep_recv(receive, socket, frames.room(), kGulpBytes, 0);
    receive->user_data = kReceived;
    if (::io_uring_submit_and_wait(&ring, awaited) < 0) {
      std::_Exit(EXIT_FAILURE);
    }
    int received = 0;
    for (unsigned done = 0; done < awaited; ++done) {
      io_uring_cqe* completion = nullptr;
      if (::io_uring_wait_cqe(&ring, &completion) != 0 || completion->res < 0) {
        std::_Exit(EXIT_FAILURE);
      }
      if (completion->user_data == kReceived) {
        received = completion->res;
      }
      ::io_uring_cqe_seen(&ring, completion);
    }
    if (received == 0) return;
    replies = frames.take(static_cast<std::size_t>(received));
  }
}
#endif

}  // namespace

bool isThere(BareTurn turn) {
  if (turn != BareTurn::Ring) return true;
#ifdef TARN_HAVE_LIBURING
  io_uring ring{};
  if (!setUp(ring)) return false;
  ::io_uring_queue_exit(&ring);
  return true;
#else
  return false;
#endif
}

void serve(BareTurn turn, int socket) {
  switch (turn) {
    case BareTurn::Receive:
      return serveByReceiving(socket);
    case BareTurn::Epoll:
      return serveByEpoll(socket);
    case BareTurn::Ring:
#ifdef TARN_HAVE_LIBURING
      return serveByRing(socket);
#else
      std::_Exit(EXIT_FAILURE);
#endif
  }
}

}  // namespace tarn::bench
