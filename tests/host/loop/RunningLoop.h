// SPDX-License-Identifier: Apache-2.0
// RunningLoop: a main loop on a thread of its own, as a test's service process in small.
#pragma once

#include <future>
#include <thread>
#include <utility>

#include "host/loop/MainLoop.h"
#include "tests/host/loop/SteadyClock.h"

namespace tarn::testing {

class RunningLoop {
 public:
  RunningLoop() = default;
  RunningLoop(const RunningLoop&) = delete;
  RunningLoop& operator=(const RunningLoop&) = delete;
  ~RunningLoop() { stop(); }

  // What is set up before start() needs no care about threads.
  void start() {
    thread_ = std::thread([this] { loop.run(); });
  }
  void stop() {
    if (thread_.joinable()) {
      loop.stop();
      thread_.join();
    }
  }
  // Runs `body` as work of the server queue and waits for what it returns.
  template <class Body>
  auto onQueue(Body body) {
    std::promise<decltype(body())> promise;
    auto result = promise.get_future();
    loop.queue()->async([&promise, &body] {
      if constexpr (std::is_void_v<decltype(body())>) {
        body();
        promise.set_value();
      } else {
        promise.set_value(body());
      }
    });
    return result.get();
  }

  SteadyClock clock;
  linux_host::MainLoop loop{clock};

 private:
  std::thread thread_;
};

}  // namespace tarn::testing
