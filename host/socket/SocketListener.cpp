// SPDX-License-Identifier: Apache-2.0
#include "host/socket/SocketListener.h"

#include <sys/epoll.h>
#include <sys/socket.h>

#include <cerrno>

#include "host/log/PrefixedLog.h"
#include "host/socket/Quotas.h"
#include "host/socket/SocketConnection.h"
#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "SocketListener";
// Clients that are accepted before others have their turn: each takes as long as a dozen messages.
constexpr int kAcceptsPerTurn = 4;
// How long accepting rests when there is no room.
constexpr std::chrono::milliseconds kAcceptPause{50};

}  // namespace

SocketListener::SocketListener(ConnectionHost& host, ListenSocket socket, Access access)
    : host_(host), socket_(std::move(socket)), access_(access) {}

SocketListener::~SocketListener() = default;

void SocketListener::resume() {
  logPrefixed(host_.log, kHostCategory, platform::LogLevel::Default, kModule, "listening on " + socket_.name());
  startAccepting();
}

void SocketListener::close() {
  if (std::exchange(accepting_, false)) {
    host_.loop.unwatch(socket_.descriptor());
  }
  socket_ = ListenSocket();
}

void SocketListener::startAccepting() {
  if (accepting_ || !socket_) return;
  accepting_ = host_.loop.watch(socket_.descriptor(), EPOLLIN, shared_from_this()).ok();
  if (!accepting_) {
    pauseAccepting("can't wait for clients" + errorSuffix(errno));
  }
}

void SocketListener::handleEvents(std::uint32_t) {
  for (int count = 0; count < kAcceptsPerTurn && accepting_; ++count) {
    if (host_.ledger.connectionsOpen >= host_.limits.maxConnections) {
      pauseAccepting(std::to_string(host_.ledger.connectionsOpen) + " connections are open, no more are allowed");
      return;
    }
    UniqueDescriptor client(::accept4(socket_.descriptor(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    if (client) {
      MemoryReserve::orGiveUp(MemoryReserve::Loss::Connection, [&] {
        const MemoryReserve::Refusable refusable;
        take(std::move(client));
      });
    } else if (errno == EAGAIN) {
      return;
    } else if (errno != EINTR && errno != ECONNABORTED) {
      pauseAccepting("can't accept a client" + errorSuffix(errno));
      return;
    }
  }
}

void SocketListener::pauseAccepting(const std::string& why) {
  // First what goes on with it: a pause that can't be ended isn't begun.
  host_.loop.queue()->asyncAfter(kAcceptPause, [weak = weak_from_this()] {
    if (const auto self = weak.lock()) {
      self->startAccepting();
    }
  });
  if (std::exchange(accepting_, false)) {
    host_.loop.unwatch(socket_.descriptor());
  }
  ++host_.ledger.acceptPauses;
  if (!std::exchange(shortage_, true)) {
    logPrefixed(host_.log, kHostCategory, platform::LogLevel::Error, kModule,
                why + "; clients wait until there is room");
  }
}

void SocketListener::take(UniqueDescriptor client) {
  if (std::exchange(shortage_, false)) {
    logPrefixed(host_.log, kHostCategory, platform::LogLevel::Default, kModule, "accepting clients again");
  }
  const auto connection = std::make_shared<SocketConnection>(host_, std::move(client), host_.nextConnection++, access_);
  const LogClientScope scope(connection->client());
  const auto delegate = delegate_.lock();
  const std::size_t limit = host_.limits.quotas.connectionsPerUser;
  const std::size_t use = host_.shares.partyOf(connection->user())->connections;
  if (use >= 2 * limit) {
    // Closed without a word: its user was told on as many connections as it may have.
    logPrefixed(host_.log, kConnectionCategory, platform::LogLevel::Error, kModule,
                "refused " + connection->description() + ": " + overQuota("connections", use, limit));
  } else if (use >= limit) {
    connection->refuse(overQuota("connections", use, limit));
  } else if (delegate == nullptr || !delegate->listenerShouldAcceptNewConnection(connection)) {
    logPrefixed(host_.log, kConnectionCategory, platform::LogLevel::Error, kModule,
                "refused " + connection->description() + ": the service takes no client now");
  }
}

}  // namespace tarn::linux_host
