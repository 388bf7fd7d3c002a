// SPDX-License-Identifier: Apache-2.0
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

// Owned by whoever drives it, through a tarnkit::TarnReportingClient or at first hand. Its memory is bounded by the
// options: what is outgoing, one reply that comes in, and a record for each outstanding request. Threads: one at a
// time, different ones in turn; an operation that comes while another thread is inside one does nothing and answers
// Misuse, false or 0.
class ClientConnection {
 public:
  using Milliseconds = std::chrono::milliseconds;
  // Told once why the connection ended, after the handlers of all requests; not after close().
  using LostHandler = std::function<void(const std::string& why)>;

  using Connected = Result<std::unique_ptr<ClientConnection>>;
  // Connects to the service's socket, waiting at most the options' timeout for a service that has others to accept
  // first. The error's number is the system's (errno), its text names the path.
  static Connected connect(const std::string& path, const Options& options);
  // With patience: for tools and tests, which rather wait a minute for a busy machine.
  static Connected connect(const std::string& path);

  // Takes over a connected stream socket. Replies longer than the options say end the connection.
  ClientConnection(Socket socket, const Options& options);
  // Flushes for at most the options' timeout, and closes. Whoever runs an operation holds the connection: a handler
  // can't destroy it.
  ~ClientConnection();
  ClientConnection(const ClientConnection&) = delete;
  ClientConnection& operator=(const ClientConnection&) = delete;

  // Replaces the one before; from within a handler, too.
  void setLostHandler(LostHandler handler);

  // Writes all that is outgoing and the request, then reads until its reply is there or the time is up (TimedOut;
  // without a time of its own the options'). Handlers of other replies are called on the way. Misuse inside a handler.
  Reply call(const Request& request, std::optional<Milliseconds> timeout = std::nullopt);
  // Puts the request in line, or leaves everything as it was and says why; the handler, which may be empty, is called
  // just when the answer is Sent. send() waits for room while a bound is reached, trySend() writes once and then says
  // Full.
  SendStatus send(const Request& request, ReplyHandler handler = {});
  SendStatus trySend(const Request& request, ReplyHandler handler = {});

  // Whether everything is written; false when the time is up, the connection has ended or a handler asks. Delivers
  // replies while it waits, since a service whose replies nobody reads takes nothing more.
  bool flush(std::optional<Milliseconds> timeout = std::nullopt);
  // How many handlers were called: of what is there now, or of what comes within the time.
  std::size_t dispatch();
  std::size_t wait(Milliseconds timeout);

  // For poll(); -1 once the connection has ended.
  int fd() const noexcept { return socket_.fd(); }
  bool wantsToWrite() const noexcept { return outgoing_.size() > written_; }
  // False as soon as the end is known, though handlers may still have to hear of it.
  bool connected() const noexcept { return socket_.open(); }
  // Requests whose handlers are still to be called, held starts included.
  std::size_t outstanding() const noexcept { return pending_.size(); }
  // Replies that belonged to no outstanding request, and were dropped.
  std::uint64_t unmatchedReplies() const noexcept { return unmatchedReplies_; }

  // Ends the connection; what is outgoing is dropped, and outstanding requests are Cancelled, at once or, inside a
  // handler, by the operation that it is inside of. Later sends are NotConnected.
  void close();

 private:
  using Clock = std::chrono::steady_clock;
  using Deadline = Clock::time_point;
  // How the connection ended, until every handler has heard of it.
  enum class Ending : std::uint8_t { None, Lost, Closed };

  // Encodes the request at the end of what is outgoing, if it fits all bounds; a request alone may be larger than
  // maxOutgoingBytes, up to maxFrameBytes.
  SendStatus append(const Request& request, ReplyHandler& handler);
  // append(), and exchange() in between until there is room or the time is up. Held starts make no room by waiting.
  SendStatus sendWithRoom(const Request& request, ReplyHandler& handler, Deadline deadline);
  // Whether one more such request would be one too many: starts have a count of their own.
  bool countsAreFull(const Request& request) const noexcept;
  // Each moves what the socket takes or has now. readSome() takes whole frames as it goes.
  void writeSome();
  void readSome(bool mayWait);
  // What came, frame by frame; one that is too long or no reply ends the connection.
  void takeFrames();
  // Finds who waits for the reply and calls them, then those who never will hear.
  void takeReply(wire::DecodedReply& decoded);
  // One round of waiting: write, wait for the socket, read, deliver.
  void exchange(Deadline deadline);
  // A round of call() without a poll: the socket's own time limit ends the wait.
  void receiveAtOnce();
  // Rounds until all is written or the time is up.
  bool flushUntil(Deadline deadline);
  Deadline deadlineAfter(std::optional<Milliseconds> timeout) const;
  // Calls one handler and counts it; no operation but send, trySend and close goes on inside.
  void deliver(const ReplyHandler& handler, Reply&& reply);
  // Calls those whose replies can't come any more; deliverLeftOvers() also all others once the connection has ended.
  void deliverCancelled();
  void deliverLeftOvers();
  // Notes the end of the connection. Handlers hear of it in deliverLeftOvers(), when no other one is running.
  void lose(std::string why);

  // As they were at the start.
  const Options options_;
  Socket socket_;
  // Bytes that came, the decoder for their frames, and who waits for what they say.
  wire::FrameBuffer frames_;
  wire::ReplyDecoder decoder_;
  PendingReplies pending_;
  // Encoded requests; what is written is cut off once it is the larger half.
  std::string outgoing_;
  std::size_t written_ = 0;   // of outgoing_
  bool writeBroken_ = false;  // the peer takes nothing more; what it sent before is still read
  // Ids ascend, so what the service answers in order is found at the front of the pending ones.
  std::uint64_t nextID_ = 1;
  std::uint64_t unmatchedReplies_ = 0;
  // Handlers that were called, ever: wait() tells the difference.
  std::size_t delivered_ = 0;
  // A handler is running.
  bool delivering_ = false;
  // What deliverLeftOvers() has still to tell, why, and to whom last.
  Ending ending_ = Ending::None;
  std::string lostWhy_;
  LostHandler lostHandler_;
  // Which thread is inside.
  OwnerCheck owner_;
};

}  // namespace tarn::client
