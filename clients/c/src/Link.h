// SPDX-License-Identifier: Apache-2.0
// Link: the connection to the service: requests out, the fronts of replies in. Never waits. When anything goes wrong it
// closes itself, and whoever owns it starts again.
//
//   begin() -> arguments into out() -> end() ... flush() -> socket -> receive() -> take(reply)
//
// Owned by the client, used under its lock. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>

#include "clients/c/src/Bytes.h"
#include "clients/c/src/Cbor.h"

namespace tarn::reporting {

// The operations that this library asks for.
enum class Operation : std::uint8_t {
  CreateReportingSession = 1,
  SetServiceType = 2,
  SetConfiguration = 4,
  StartReportingSessionForID = 5,
  StopReportingSessionForID = 7,
  OpenRing = 102,
  DeclareShape = 103,
};

// One connection after the other to one service. Requests are gathered in out() and go out with flush(); descriptors go
// with the first byte of the request that they belong to. What comes in is kept until it is a whole reply.
class Link {
 public:
  // Of a socket path, with the zero after it: what the system's address has room for.
  static constexpr std::size_t kMostPath = 108;

  Link() = default;
  Link(const Link&) = delete;
  Link& operator=(const Link&) = delete;

  // Drops what an earlier connection left, and connects without waiting. Whether there is a service at the path; errno
  // says why not, ENAMETOOLONG for a path that is too long.
  bool connect(const char* path) noexcept;
  // Also true when the service has gone and nobody has received anything since.
  bool isOpen() const noexcept { return socket_ >= 0; }
  // For poll(); -1 while it is closed.
  int descriptor() const noexcept { return socket_; }
  // Ends the connection and drops what was unsent and unread. Closing a closed one does nothing.
  void close() noexcept;

  // Begins a request with so many arguments, which are put into out() then; its id.
  std::uint64_t begin(Operation operation, unsigned arguments) noexcept;
  // Where the arguments are put, in CBOR, between begin() and end(); what isn't sent yet lies before them.
  Bytes& out() noexcept { return out_; }
  // Completes the request. When memory ran out, the link closes itself: a request is missing then, and all is to be
  // said again on a new connection.
  void end() noexcept;
  // Sends two descriptors with the request that is begun, once its first byte goes out; they stay the caller's and must
  // be open until then. False when too many requests with descriptors wait.
  bool attach(int first, int second) noexcept;

  // Sends what the system takes now. After an error nothing more is sent, but what the service said last can be
  // received.
  void flush() noexcept;
  bool hasUnsent() const noexcept { return sent_ != out_.size(); }
  // Requests that have no reply yet. A started session's is answered only when the session stops.
  std::uint64_t outstanding() const noexcept { return outstanding_; }

  // Receives what is there and calls `take(reply)` for each reply, in their order; the reply's text lives as long as
  // that call. Closes itself at the end of the connection, on an error, on a frame longer than any reply that is
  // expected and on one that is no reply.
  template <class Take>
  void receive(Take take) noexcept {
    while (isOpen() && receiveSome()) {
      ReplyFront reply;
      while (nextReply(reply)) {
        outstanding_ -= outstanding_ != 0 ? 1 : 0;
        take(reply);
      }
      dropTaken();
    }
  }

 private:
  // Twice as many as a client has writers, whose rings are all that is sent so.
  static constexpr std::size_t kMostAttachments = 64;
  struct Attachment {
    std::size_t offset;  // in out_
    int descriptors[2];
  };

  // What sendmsg() answered for the next piece.
  long sendPart() noexcept;
  // Whether bytes came.
  bool receiveSome() noexcept;
  // Takes the next whole frame off what came; false when there is none.
  bool nextReply(ReplyFront& reply) noexcept;
  // Makes room for more once all whole replies were taken.
  void dropTaken() noexcept;

  // Everything is of the connection that is open now.
  int socket_ = -1;
  Bytes out_;
  std::size_t sent_ = 0;
  // Where the request that is begun starts in out_, its length before it.
  std::size_t frameAt_ = 0;
  Attachment attachments_[kMostAttachments] = {};
  std::size_t attachmentCount_ = 0;
  Bytes in_;
  std::size_t taken_ = 0;  // of in_
  // Goes on over connections, so that an id of an earlier one means nothing on a later one.
  std::uint64_t nextId_ = 1;
  std::uint64_t outstanding_ = 0;
};

}  // namespace tarn::reporting
