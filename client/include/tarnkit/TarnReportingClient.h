// SPDX-License-Identifier: Apache-2.0
// TarnReportingClient: one connection to the reporting service.
//
// The owner drives it: there is no thread inside, a reply is read by whoever waits for it. So a call costs one write
// and one read and no hand-over between threads, and an owner with an event loop watches fd() and calls dispatch().
//
//   call()              write, then read until that reply is there; other replies are delivered on the way
//   send(), trySend()   append to the outgoing buffer; written by flush(), or once autoFlushBytes have gathered
//   dispatch(), wait()  write what can be written, read what is there, deliver
//
// Whatever waits does so at most as long as it is told, else as Options::timeout says.
//
// Handlers run on the owner's thread, inside call, send, flush, dispatch, wait, close and the destruction, never inside
// trySend. A handler may send, trySend, close and destroy the client; inside a handler send doesn't wait either. It may
// not call, flush, dispatch or wait: that does nothing and answers Misuse, false or 0, as does an operation while
// another thread is inside one. Different threads may use one client in turn.
//
// Every request that was sent has its handler called exactly once: with the reply, with ConnectionLost when the
// connection ends (then the lost handler is called once, after them), or with Cancelled at close(). A start's reply is
// held by the service until the session stops; when it can never come (the session was destroyed, replaced or retyped,
// or was running already) the handler gets Cancelled. SIGPIPE is never raised. Connecting again is the owner's choice.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <string>

#include <tarnkit/Options.h>
#include <tarnkit/Reply.h>
#include <tarnkit/Requests.h>

namespace tarn::client {
class ClientConnection;
}

namespace tarnkit {

class TarnReportingClient {
 public:
  using Milliseconds = std::chrono::milliseconds;
  using LostHandler = std::function<void(const std::string& why)>;

  struct Connected {
    std::unique_ptr<TarnReportingClient> client;  // null on failure
    int errorNumber = 0;                          // of the system call that failed
    std::string error;                            // what failed, with the path
  };
  // Connects to the service's socket.
  static Connected connect(const std::string& path, const Options& options = {});

  // The library's own.
  explicit TarnReportingClient(std::unique_ptr<tarn::client::ClientConnection> client);
  // Flushes and closes. What still isn't written when the time is up is lost. Inside a handler it closes at once, and
  // the handlers that are left are called by the operation that it is inside of.
  ~TarnReportingClient();
  TarnReportingClient(const TarnReportingClient&) = delete;
  TarnReportingClient& operator=(const TarnReportingClient&) = delete;

  void setLostHandler(LostHandler handler);

  // Sends and waits for the reply. Everything sent before is written first.
  Reply call(const Request& request, std::optional<Milliseconds> timeout = std::nullopt);
  // Sends; where a bound is reached waits until the service has taken or answered enough, then is Full. Not Sent: the
  // handler is never called.
  SendStatus send(const Request& request, ReplyHandler handler = {});
  // Never waits and never reads. What it allocates is bounded by the options.
  SendStatus trySend(const Request& request, ReplyHandler handler = {});
  // The reply as a future, which becomes ready while the owner drives the client.
  std::future<Reply> sendForFuture(const Request& request);

  // Writes everything that is waiting; reads and delivers replies while the service doesn't take it. False when the
  // connection is lost or the time is up.
  bool flush(std::optional<Milliseconds> timeout = std::nullopt);
  // Writes and reads what can be without waiting. Returns how many handlers were called.
  std::size_t dispatch();
  // Waits until there is something to write or read, at most so long, then does what dispatch does.
  std::size_t wait(Milliseconds timeout);

  // For poll(): readable always matters, writable while wantsToWrite(). -1 once the connection is over.
  int fd() const noexcept;
  bool wantsToWrite() const noexcept;
  bool connected() const noexcept;
  // Requests whose handlers are still to be called, held starts included.
  std::size_t outstanding() const noexcept;
  // Replies that nobody waited for, and were dropped.
  std::uint64_t unmatchedReplies() const noexcept;

  // Ends the connection. What is still outgoing is not written: flush() first. Outstanding requests are Cancelled.
  void close();

 private:
  std::shared_ptr<tarn::client::ClientConnection> client_;  // an operation holds it, too
};

}  // namespace tarnkit
