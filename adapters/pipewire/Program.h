// SPDX-License-Identifier: Apache-2.0
// Program: tarnreporting-pipewire at work: PipeWire's loop, the book, and who is told.
//
// It comes to PipeWire as soon as there is one and again when it went, in pauses that grow to four seconds. Owned by
// main(). Threads: one.
#pragma once

#include <pipewire/pipewire.h>

#include <memory>
#include <string>

#include "adapters/pipewire/ActionOutlet.h"
#include "adapters/pipewire/AdapterLog.h"
#include "adapters/pipewire/AdapterOptions.h"
#include "adapters/pipewire/core/Rules.h"
#include "adapters/pipewire/core/StreamBook.h"
#include "adapters/pipewire/graph/GraphWatcher.h"

namespace tarn::streams {

class Program final : private GraphWatcher::Listener {
 public:
  // PipeWire's library is to be initialized.
  Program(const AdapterOptions& options, const Rules& rules);
  ~Program() override;
  Program(const Program&) = delete;
  Program& operator=(const Program&) = delete;

  // Until a signal, or with --once until all was looked at. The exit status.
  int run();

 private:
  void said(bool isQuiet) override;
  void lost(const std::string& why) override;

  bool open();
  void connect();
  void connectLater();
  void forgetGraph();
  void carryOut();
  void stop(int status);
  static void signalled(void* data, int);
  static void due(void* data, std::uint64_t);

  const AdapterOptions options_;
  AdapterLog log_;
  ActionOutlet outlet_;
  StreamBook book_;
  pw_main_loop* loop_ = nullptr;
  pw_context* context_ = nullptr;
  spa_source* timer_ = nullptr;
  std::unique_ptr<GraphWatcher> watcher_;
  int status_ = 0;
  int attempts_ = 0;     // to connect, since the last that succeeded
  bool isLost_ = false;  // and what is left of the connection is yet to go
};

}  // namespace tarn::streams
