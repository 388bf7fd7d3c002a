// SPDX-License-Identifier: Apache-2.0
// ScriptedServer: the service's end of a socket, for the tests of the client library. It answers when the test says so,
// so that every order of requests and replies can be had.
#pragma once

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cstddef>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "client/ClientConnection.h"
#include "wire/Encoder.h"
#include "wire/FrameBuffer.h"
#include "wire/RequestDecoder.h"

namespace tarn::testing {

class ScriptedServer {
 public:
  explicit ScriptedServer(int fd) : fd_(fd) {}
  ScriptedServer(const ScriptedServer&) = delete;
  ScriptedServer& operator=(const ScriptedServer&) = delete;
  ~ScriptedServer() { hangUp(); }

  // The next request, waited for; nothing when the client hung up.
  std::optional<wire::DecodedRequest> take() {
    std::span<const std::byte> frame;
    while (frames_.next(frame) != wire::FrameBuffer::Next::Frame) {
      const std::span<std::byte> space = frames_.space();
      const ssize_t received = ::recv(fd_, space.data(), space.size(), 0);
      if (received <= 0) return std::nullopt;
      frames_.received(static_cast<std::size_t>(received));
    }
    wire::DecodedRequest request;
    wire::Refusal refusal;
    if (decoder_.decode(frame, request, refusal) != wire::DecodeVerdict::Ok) return std::nullopt;
    return request;
  }

  // Whether the client has sent anything that wasn't taken.
  bool hasInput() const {
    pollfd watched{fd_, POLLIN, 0};
    return frames_.pendingBytes() > 0 || ::poll(&watched, 1, 0) > 0;
  }

  void write(const std::string& bytes) {
    for (std::size_t at = 0; at < bytes.size();) {
      const ssize_t sent = ::send(fd_, bytes.data() + at, bytes.size() - at, MSG_NOSIGNAL);
      if (sent <= 0) return;
      at += static_cast<std::size_t>(sent);
    }
  }
  void reply(std::uint64_t id, std::initializer_list<plist::ValueView> results = {}) {
    std::string out;
    wire::Encoder(out).reply(id, results);
    write(out);
  }
  void fail(std::uint64_t id, std::int64_t code, std::string_view text) {
    std::string out;
    wire::Encoder(out).errorReply(id, "domain", code, text);
    write(out);
  }
  // Takes so many requests and answers each with true.
  void acknowledge(std::size_t count) {
    for (; count > 0; --count) {
      const std::optional<wire::DecodedRequest> request = take();
      if (!request) return;
      reply(request->id, {true});
    }
  }

  void hangUp() {
    if (fd_ >= 0) {
      ::close(std::exchange(fd_, -1));
    }
  }

 private:
  int fd_;
  wire::FrameBuffer frames_;
  wire::RequestDecoder decoder_;
};

// A client and its server, joined.
struct Pair {
  // A test that asks for no other time has enough of it on a busy machine.
  explicit Pair(client::Options options = {}) {
    if (options.timeout == client::Options().timeout) {
      options.timeout = std::chrono::minutes(1);
    }
    int fds[2];
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, fds) != 0) throw std::runtime_error("socketpair");
    client = std::make_unique<client::ClientConnection>(client::Socket(fds[0]), options);
    server = std::make_unique<ScriptedServer>(fds[1]);
  }

  std::unique_ptr<client::ClientConnection> client;
  std::unique_ptr<ScriptedServer> server;
};

// Runs the server's part on a thread of its own while the test waits in the client.
template <class Body>
class Served {
 public:
  explicit Served(Body body) : thread_(std::move(body)) {}
  Served(const Served&) = delete;
  Served& operator=(const Served&) = delete;
  ~Served() { thread_.join(); }

 private:
  std::thread thread_;
};

// Remembers what its handlers were given.
class Outcomes {
 public:
  client::ReplyHandler handler(std::string name) {
    return [this, name = std::move(name)](client::Reply&& reply) {
      heard_.push_back(name + " " + std::string(client::outcomeName(reply.outcome)));
    };
  }
  const std::vector<std::string>& heard() const { return heard_; }

 private:
  std::vector<std::string> heard_;
};

}  // namespace tarn::testing
