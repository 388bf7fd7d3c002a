// SPDX-License-Identifier: Apache-2.0
#include "client/ClientConnection.h"

#include <utility>

#include "client/tarnkit/Values.h"

#include <tarnkit/TarnReportingClient.h>

namespace tarnkit {

namespace {

tarn::client::ReplyHandler unpacking(ReplyHandler handler) {
  if (!handler) return {};
  return [handler = std::move(handler)](tarn::client::Reply&& reply) {
    handler(tarn::client::unpacked(std::move(reply)));
  };
}

}  // namespace

TarnReportingClient::Connected TarnReportingClient::connect(const std::string& path, const Options& options) {
  auto inner = tarn::client::ClientConnection::connect(path, options);
  Connected connected;
  connected.errorNumber = static_cast<int>(inner.error.code());
  connected.error = inner.error.text();
  if (inner.ok()) {
    connected.client = std::make_unique<TarnReportingClient>(std::move(inner.value));
  }
  return connected;
}

TarnReportingClient::TarnReportingClient(std::unique_ptr<tarn::client::ClientConnection> client)
    : client_(std::move(client)) {}

// In a handler an operation holds the connection, too: it ends it then.
TarnReportingClient::~TarnReportingClient() {
  if (client_.use_count() > 1) {
    client_->close();
  }
}

void TarnReportingClient::setLostHandler(LostHandler handler) {
  client_->setLostHandler(std::move(handler));
}

Reply TarnReportingClient::call(const Request& request, std::optional<Milliseconds> timeout) {
  const auto held = client_;
  return tarn::client::unpacked(held->call(request.content(), timeout));
}

SendStatus TarnReportingClient::send(const Request& request, ReplyHandler handler) {
  const auto held = client_;
  return held->send(request.content(), unpacking(std::move(handler)));
}

SendStatus TarnReportingClient::trySend(const Request& request, ReplyHandler handler) {
  return client_->trySend(request.content(), unpacking(std::move(handler)));
}

std::future<Reply> TarnReportingClient::sendForFuture(const Request& request) {
  auto promise = std::make_shared<std::promise<Reply>>();
  std::future<Reply> future = promise->get_future();
  const SendStatus status = send(request, [promise](Reply&& reply) { promise->set_value(std::move(reply)); });
  if (status != SendStatus::Sent) {
    promise->set_value(tarn::client::unpacked(tarn::client::notSent(status)));
  }
  return future;
}

bool TarnReportingClient::flush(std::optional<Milliseconds> timeout) {
  const auto held = client_;
  return held->flush(timeout);
}

std::size_t TarnReportingClient::dispatch() {
  const auto held = client_;
  return held->dispatch();
}

std::size_t TarnReportingClient::wait(Milliseconds timeout) {
  const auto held = client_;
  return held->wait(timeout);
}

int TarnReportingClient::fd() const noexcept {
  return client_->fd();
}

bool TarnReportingClient::wantsToWrite() const noexcept {
  return client_->wantsToWrite();
}

bool TarnReportingClient::connected() const noexcept {
  return client_->connected();
}

std::size_t TarnReportingClient::outstanding() const noexcept {
  return client_->outstanding();
}

std::uint64_t TarnReportingClient::unmatchedReplies() const noexcept {
  return client_->unmatchedReplies();
}

void TarnReportingClient::close() {
  const auto held = client_;
  held->close();
}

}  // namespace tarnkit
