// ClientConnection: what tarnkit::TarnReportingClient stands on, and the tools with it: the same client with the
// requests and values of the wire. What it promises stands in that class's header.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "client/OwnerCheck.h"
#include "client/PendingReplies.h"
#include "client/Reply.h"
#include "client/Requests.h"
#include "client/Socket.h"
#include "plist/Result.h"
#include "wire/FrameBuffer.h"
#include "wire/ReplyDecoder.h"

#include <tarnkit/Options.h>

namespace tarn::client {

using tarnkit::Options;
using tarnkit::SendStatus;

class ClientConnection {
 public:
  using Milliseconds = std::chrono::milliseconds;
  using LostHandler = std::function<void(const std::string& why)>;

  using Connected = Result<std::unique_ptr<ClientConnection>>;
  // Connects to the service's socket. An error names the path.
  static Connected connect(const std::string& path, const Options& options);
  // With patience: for tools and tests, which rather wait a minute for a busy machine.
  static Connected connect(const std::string& path);

  // Takes over a connected stream socket.
  ClientConnection(Socket socket, const Options& options);
  // Flushes for at most the options' timeout, and closes. Whoever runs an operation holds the connection: a handler
  // can't destroy it.
  ~ClientConnection();
  ClientConnection(const ClientConnection&) = delete;
  ClientConnection& operator=(const ClientConnection&) = delete;

  void setLostHandler(LostHandler handler);

  Reply call(const Request& request, std::optional<Milliseconds> timeout = std::nullopt);
  SendStatus send(const Request& request, ReplyHandler handler = {});
  SendStatus trySend(const Request& request, ReplyHandler handler = {});

  bool flush(std::optional<Milliseconds> timeout = std::nullopt);
  std::size_t dispatch();
  std::size_t wait(Milliseconds timeout);

  int fd() const noexcept { return socket_.fd(); }
  bool wantsToWrite() const noexcept { return outgoing_.size() > written_; }
  bool connected() const noexcept { return socket_.open(); }
  std::size_t outstanding() const noexcept { return pending_.size(); }
  std::uint64_t unmatchedReplies() const noexcept { return unmatchedReplies_; }

  void close();

 private:
  using Clock = std::chrono::steady_clock;
  using Deadline = Clock::time_point;
  // How the connection ended, until every handler has heard of it.
  enum class Ending : std::uint8_t { None, Lost, Closed };

  SendStatus append(const Request& request, ReplyHandler& handler);
  SendStatus sendWithRoom(const Request& request, ReplyHandler& handler, Deadline deadline);
  bool countsAreFull(const Request& request) const noexcept;
  void writeSome();
  void readSome(bool mayWait);
  void takeFrames();
  void takeReply(wire::DecodedReply& decoded);
  void exchange(Deadline deadline);
  void receiveAtOnce();
  bool flushUntil(Deadline deadline);
  Deadline deadlineAfter(std::optional<Milliseconds> timeout) const;
  void deliver(const ReplyHandler& handler, Reply&& reply);
  void deliverCancelled();
  void deliverLeftOvers();
  void lose(std::string why);

  const Options options_;
  Socket socket_;
  wire::FrameBuffer frames_;
  wire::ReplyDecoder decoder_;
  PendingReplies pending_;
  std::string outgoing_;
  std::size_t written_ = 0;   // of outgoing_
  bool writeBroken_ = false;  // the peer takes nothing more; what it sent before is still read
  std::uint64_t nextID_ = 1;
  std::uint64_t unmatchedReplies_ = 0;
  std::size_t delivered_ = 0;
  bool delivering_ = false;
  Ending ending_ = Ending::None;
  std::string lostWhy_;
  LostHandler lostHandler_;
  OwnerCheck owner_;
};

}  // namespace tarn::client
