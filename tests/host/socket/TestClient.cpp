// SPDX-License-Identifier: Apache-2.0
#include "tests/host/socket/TestClient.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>

#include <cstring>

#include "wire/Encoder.h"

namespace tarn::testing {

TestClient::TestClient() : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  const timeval patience{20, 0};
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
  ::setsockopt(socket_.get(), SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
}

TestClient::TestClient(const std::string& path) : TestClient() {
  connect(path);
}

bool TestClient::connect(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::memcpy(address.sun_path, path.data(), path.size());
  connected_ = ::connect(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
  return connected_;
}

bool TestClient::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const auto sent = ::send(socket_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent <= 0) return false;
    bytes.remove_prefix(static_cast<std::size_t>(sent));
  }
  return true;
}

bool TestClient::requestWith(std::uint64_t id, const wire::Request& request, int first, int second) {
  std::string bytes = encoded(id, request);
  iovec content{.iov_base = bytes.data(), .iov_len = bytes.size()};
  const int descriptors[] = {first, second};
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof descriptors)] = {};
  msghdr message{};
  message.msg_iov = &content;
  message.msg_iovlen = 1;
  message.msg_control = control;
  message.msg_controllen = sizeof control;
  cmsghdr* const rights = CMSG_FIRSTHDR(&message);
  rights->cmsg_level = SOL_SOCKET;
  rights->cmsg_type = SCM_RIGHTS;
  rights->cmsg_len = CMSG_LEN(sizeof descriptors);
  std::memcpy(CMSG_DATA(rights), descriptors, sizeof descriptors);
  return ::sendmsg(socket_.get(), &message, MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
}

bool TestClient::request(std::uint64_t id, const wire::Request& request) {
  return send(encoded(id, request));
}

bool TestClient::receive(char* at, std::size_t size) {
  while (size != 0) {
    const auto received = ::recv(socket_.get(), at, size, 0);
    if (received <= 0) return false;
    at += received;
    size -= static_cast<std::size_t>(received);
  }
  return true;
}

std::optional<wire::DecodedReply> TestClient::reply() {
  std::uint32_t length = 0;
  if (!receive(reinterpret_cast<char*>(&length), sizeof length)) return std::nullopt;
  std::string body(length, '\0');
  if (!receive(body.data(), body.size())) return std::nullopt;
  wire::DecodedReply reply;
  if (decoder_.decode(std::as_bytes(std::span(body)), reply).failed()) return std::nullopt;
  return reply;
}

std::optional<wire::DecodedReply> TestClient::ask(std::uint64_t id, const wire::Request& asked) {
  return request(id, asked) ? reply() : std::nullopt;
}

std::optional<plist::Dictionary> TestClient::status() {
  const auto answer = ask(0, requestOf(wire::Operation::Status));
  if (!answer || answer->results.size() != 1 || answer->results[0].kind() != plist::Kind::Dictionary) {
    return std::nullopt;
  }
  return answer->results[0].view().dictionary();
}

bool TestClient::ended() {
  char byte = 0;
  const auto received = ::recv(socket_.get(), &byte, 1, 0);
  return received == 0 || (received < 0 && errno == ECONNRESET);
}

bool TestClient::readable(int milliseconds) const {
  pollfd descriptor{socket_.get(), POLLIN, 0};
  return ::poll(&descriptor, 1, milliseconds) == 1;
}

void TestClient::shutDownSending() {
  ::shutdown(socket_.get(), SHUT_WR);
}

std::string framed(std::string_view body) {
  const auto length = static_cast<std::uint32_t>(body.size());
  std::string frame(reinterpret_cast<const char*>(&length), sizeof length);
  return frame += body;
}

std::string encoded(std::uint64_t id, const wire::Request& request) {
  std::string bytes;
  wire::Encoder(bytes).request(id, request);
  return bytes;
}

wire::Request requestOf(wire::Operation operation, std::int64_t reporterID) {
  wire::Request request;
  request.operation = operation;
  request.reporterID = reporterID;
  return request;
}

wire::Request messageRequest(const plist::Dictionary& message) {
  wire::Request request;
  request.operation = wire::Operation::SendMessage;
  request.dictionary = message;
  request.category = 3;
  request.type = 4;
  return request;
}

}  // namespace tarn::testing
