// Link: the connection to the service: requests out, the fronts of replies in. Never waits. When anything goes wrong it
// closes itself, and whoever owns it starts again.
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

class Link {
 public:
  // Of a socket path, with the zero after it.
  static constexpr std::size_t kMostPath = 108;

  Link() = default;
  Link(const Link&) = delete;
  Link& operator=(const Link&) = delete;

  // Whether there is a service at the path; errno says why not.
  bool connect(const char* path) noexcept;
  bool isOpen() const noexcept { return socket_ >= 0; }
  int descriptor() const noexcept { return socket_; }
  void close() noexcept;

  // Begins a request with so many arguments, which are put into out() then; its id.
  std::uint64_t begin(Operation operation, unsigned arguments) noexcept;
  Bytes& out() noexcept { return out_; }
  void end() noexcept;
  // Sends two descriptors with the request that is begun.
  bool attach(int first, int second) noexcept;

  // Sends what the system takes now.
  void flush() noexcept;
  bool hasUnsent() const noexcept { return sent_ != out_.size(); }
  // Requests that have no reply yet.
  std::uint64_t outstanding() const noexcept { return outstanding_; }

  // Receives what is there and calls `take(reply)` for each reply. Closes itself at the end of the connection.
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
  static constexpr std::size_t kMostAttachments = 64;
  struct Attachment {
    std::size_t offset;  // in out_
    int descriptors[2];
  };

  long sendPart() noexcept;
  bool receiveSome() noexcept;
  bool nextReply(ReplyFront& reply) noexcept;
  void dropTaken() noexcept;

  int socket_ = -1;
  Bytes out_;
  std::size_t sent_ = 0;
  std::size_t frameAt_ = 0;
  Attachment attachments_[kMostAttachments] = {};
  std::size_t attachmentCount_ = 0;
  Bytes in_;
  std::size_t taken_ = 0;  // of in_
  std::uint64_t nextId_ = 1;
  std::uint64_t outstanding_ = 0;
};

}  // namespace tarn::reporting
