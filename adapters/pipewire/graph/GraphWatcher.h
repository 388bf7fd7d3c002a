// SPDX-License-Identifier: Apache-2.0
// GraphWatcher: looks at PipeWire and tells a StreamBook what happens there.
//
// It binds the registry's clients, devices, links, the default metadata, and the nodes of audio; and the profiler,
// while a stream that is reported runs. What belongs together comes in several events, so after each it asks PipeWire
// to answer when all that it had asked for before is told, and then has the book say what changed. It runs in the loop
// of the program, never in a data thread, and changes nothing in PipeWire.
//
// Owned by the program. Threads: that of the loop.
#pragma once

#include <memory>
#include <string>

#include "adapters/pipewire/core/StreamBook.h"

struct pw_context;

namespace tarn::streams {

class GraphWatcher {
 public:
  // Who is told; called from inside the loop, never from inside a call of the watcher.
  class Listener {
   public:
    virtual ~Listener() = default;
    // The book may have something to do. `isQuiet`: all that was there when it was asked last is told.
    virtual void said(bool isQuiet) = 0;
    // The connection is gone; `disconnect` is yet to be called, but not from here.
    virtual void lost(const std::string& why) = 0;
  };

  // The context, the book and the listener outlive it. An empty remote is PipeWire's own default.
  GraphWatcher(pw_context* context, StreamBook& book, Listener& listener, std::string remote, bool profiles);
  ~GraphWatcher();
  GraphWatcher(const GraphWatcher&) = delete;
  GraphWatcher& operator=(const GraphWatcher&) = delete;

  // Whether there is a PipeWire, which is looked at from then on.
  bool connect();
  // Leaves the book as it is.
  void disconnect();

 private:
  class Objects;
  pw_context* context_;
  StreamBook& book_;
  Listener& listener_;
  std::string remote_;
  bool profiles_;
  std::unique_ptr<Objects> objects_;  // while connected
};

// Nanoseconds since 1970 UTC.
Moment wallClock();

}  // namespace tarn::streams
