// SPDX-License-Identifier: Apache-2.0
// SocketFixture: listener, connections and loop over a real socket, with a recording service after them.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "host/socket/ConnectionHost.h"
#include "host/socket/SocketListener.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/ScratchFolder.h"
#include "tests/host/loop/RunningLoop.h"
#include "tests/host/socket/BoundSocket.h"
#include "tests/host/socket/RecordingService.h"
#include "tests/host/socket/TestClient.h"

namespace tarn::testing {

class SocketFixture : public ::testing::Test {
 protected:
  // `limits` and `access` are set by tests before serve().
  void serve() {
    host_ = std::make_unique<linux_host::ConnectionHost>(running_.loop, log_, limits);
    host_->gate.setPauseSource([this] { return paused.load(); });
    auto socket = bindTo(path_);
    ASSERT_EQ(socket.error.text(), "");
    listener_ = std::make_shared<linux_host::SocketListener>(*host_, std::move(socket.value), access);
    listener_->setDelegate(service_);
    listener_->resume();
    running_.start();
  }
  void TearDown() override {
    running_.stop();
    if (listener_ != nullptr) {
      listener_->close();
    }
  }

  std::vector<std::string> events() {
    return running_.onQueue([this] { return service_->events; });
  }
  bool eventuallyHappens(const std::string& event) {
    return eventually([&] {
      const auto all = events();
      return std::find(all.begin(), all.end(), event) != all.end();
    });
  }
  // The place of an event among all; the end when it didn't happen.
  std::ptrdiff_t placeOf(const std::string& event) {
    const auto all = events();
    return std::find(all.begin(), all.end(), event) - all.begin();
  }
  // Requests that wait for the gate, one a connection.
  std::size_t held() {
    return running_.onQueue([this] { return host_->gate.heldCount(); });
  }
  linux_host::Ledger ledger() {
    return running_.onQueue([this] { return host_->ledger; });
  }
  std::uint64_t cuts(linux_host::CutReason reason) { return ledger().connectionsCut[static_cast<std::size_t>(reason)]; }
  std::size_t errorLines() const { return log_.entries(platform::LogLevel::Error).size(); }
  void resumeRequests() {
    paused = false;
    host_->resumeRequests();
  }

  linux_host::HostLimits limits;
  linux_host::Access access = linux_host::Access::Everything;
  std::atomic<bool> paused{false};
  ScratchFolder folder_;
  const std::string path_ = folder_.file("socket");
  RecordingLog log_;
  RunningLoop running_;
  std::unique_ptr<linux_host::ConnectionHost> host_;
  std::shared_ptr<RecordingService> service_ = std::make_shared<RecordingService>(running_.loop.queue());
  std::shared_ptr<linux_host::SocketListener> listener_;
};

}  // namespace tarn::testing

// What the tests of this folder talk with.
namespace tarn::linux_host {
using testing::encoded;
using testing::eventually;
using testing::messageRequest;
using testing::requestOf;
using testing::TestClient;
using wire::Operation;
}  // namespace tarn::linux_host
