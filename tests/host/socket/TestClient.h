// SPDX-License-Identifier: Apache-2.0
// TestClient: a client over a real socket, plain and blocking, that can misbehave. Threads: one at a time.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "host/system/UniqueDescriptor.h"
#include "wire/ReplyDecoder.h"
#include "wire/Request.h"

namespace tarn::testing {

class TestClient {
 public:
  // Connects; see connected().
  explicit TestClient(const std::string& path);
  // A socket that is not connected yet; connect() does it.
  TestClient();

  bool connect(const std::string& path);
  bool connected() const noexcept { return connected_; }

  // Whether all of it went out.
  bool send(std::string_view bytes);
  bool request(std::uint64_t id, const wire::Request& request);
  // The same with two descriptors on its bytes.
  bool requestWith(std::uint64_t id, const wire::Request& request, int first, int second);
  // The next reply; nothing when the connection is over or nothing came for a long time.
  std::optional<wire::DecodedReply> reply();
  // Sends the request and takes the next reply.
  std::optional<wire::DecodedReply> ask(std::uint64_t id, const wire::Request& request);
  std::optional<plist::Dictionary> status();
  // Waits for the end of the connection; false when bytes came instead.
  bool ended();
  // Whether a reply lies there within this time.
  bool readable(int milliseconds) const;
  void shutDownSending();
  void close() { socket_.reset(); }

 private:
  bool receive(char* at, std::size_t size);

  linux_host::UniqueDescriptor socket_;
  bool connected_ = false;
  wire::ReplyDecoder decoder_;
};

// One frame of these bytes.
std::string framed(std::string_view body);
// The frame of a request.
std::string encoded(std::uint64_t id, const wire::Request& request);
// Requests by operation, with the reporter ID where there is one.
wire::Request requestOf(wire::Operation operation, std::int64_t reporterID = 0);
wire::Request messageRequest(const plist::Dictionary& message);

}  // namespace tarn::testing
