// SPDX-License-Identifier: Apache-2.0
// Progress: one line on a terminal's stderr while work takes longer than a second: what is done, how far it is, how
// long it has taken. The line is taken away at the end. Where stderr is no terminal, or nobody wants remarks, nothing
// happens.
//
// A thread of its own writes, so whoever works is held up by nothing and only leaves a number. Owner: a command, around
// the work; nothing is printed on that terminal meanwhile. Threads: one, but at() any.
//
//   { Progress progress(context.terminal.progress, "reading the sessions"); ... progress.at(0.5); ... }
#pragma once

#include <atomic>
#include <chrono>
#include <functional>
#include <string>
#include <thread>
#include <utility>

#include "host/system/UniqueDescriptor.h"

namespace tarn::ctl {

// Where progress is told, if it is.
struct ProgressPlace {
  bool isTold = false;
  int fd = 2;
  std::chrono::milliseconds after{1000};  // work that is over by then has none
};

// Takes how much of the work is done, from 0 to 1.
using ProgressHandler = std::function<void(double part)>;

class Progress {
 public:
  // `what` is the program's own: "reading the sessions".
  Progress(const ProgressPlace& place, std::string what);
  // Takes the line away.
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  // How much is done, from 0 to 1. Until the first call only the time is told.
  void at(double part) noexcept { part_.store(part, std::memory_order_relaxed); }
  // at() for those who know no commands; this outlives it.
  ProgressHandler handler() {
    return [this](double part) { at(part); };
  }

 private:
  // The thread's whole life.
  void run();
  std::string line() const;

  const ProgressPlace place_;
  const std::string what_;
  const std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
  std::atomic<double> part_{-1};
  linux_host::UniqueDescriptor end_;  // an eventfd, which has something to read at the end
  std::thread thread_;
};

// Does the work, which takes a ProgressHandler, with a line about it; what it answers.
template <class Work>
auto withProgress(const ProgressPlace& place, std::string what, Work work) {
  Progress progress(place, std::move(what));
  return work(progress.handler());
}

}  // namespace tarn::ctl
