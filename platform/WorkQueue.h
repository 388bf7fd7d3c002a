// SPDX-License-Identifier: Apache-2.0
// WorkQueue: a serial queue. Work is run one piece at a time, in the order in which it was handed over.
//
// Threads: work may be handed over on any thread, that of the queue included. Nothing handed over is ever refused or
// dropped while the process lives; whoever takes work from outside the process watches waiting() and takes less.
#pragma once

#include <chrono>
#include <cstddef>
#include <memory>
#include <string_view>
#include <utility>

#include "platform/UniqueFunction.h"

namespace tarn::platform {

// A piece of work. It is destroyed after it ran, on the queue, before the next piece begins.
using Work = UniqueFunction<void()>;

// Shared by whoever hands over work; it lives as long as one of them or its work does.
class WorkQueue {
 public:
  virtual ~WorkQueue() = default;
  // Runs `work` after everything handed over before.
  virtual void async(Work work) = 0;
  // Hands `work` over once `delay` has passed, never earlier. Equal moments keep the order of the calls.
  virtual void asyncAfter(std::chrono::nanoseconds delay, Work work) = 0;
  // Whether the caller runs as work of this queue.
  virtual bool isCurrent() const noexcept = 0;
  // Pieces of work handed over and not yet begun; delayed ones count from their moment on.
  virtual std::size_t waiting() const noexcept = 0;

  // For work that is long by nature and is done in slices, as work of this queue. Charges so much to whoever it is done
  // for, a unit being about a microsecond. True: others are to have their turn, and what is left goes to asyncNext().
  virtual bool spend(std::size_t cost) {
    static_cast<void>(cost);
    return false;
  }
  // Runs the rest of the work that runs now when its turn comes again, ahead of what was handed over for the same
  // client. Only after spend() was true, and as the last thing the work does.
  virtual void asyncNext(Work rest) { async(std::move(rest)); }
};

// A serial queue whose work can wait for something without holding a thread.
//
//   start task:  ask the back-end -> suspend(9 s, next)         back-end's thread:  resume()
//   the queue:   [nothing runs .........................]  next  what was handed over meanwhile, in its order
class SuspendableQueue : public WorkQueue {
 public:
  // Like async(), for work that somebody waits for: where many pieces are gathered before a thread is woken for them,
  // one is woken for this piece.
  virtual void asyncAtOnce(Work work) { async(std::move(work)); }
  // Runs what waits, in its order and at most a handful of pieces, on the caller's thread and still as work of this
  // queue. While another thread runs work of it the call waits for that, at most so long. Nothing happens while it is
  // suspended.
  virtual void help(std::chrono::nanoseconds longest) { static_cast<void>(longest); }
  // For work of this queue, once and as the last thing it does: nothing more of the queue begins until resume() is
  // called or `longest` has passed. Then `next` runs, ahead of all that waits.
  virtual void suspend(std::chrono::nanoseconds longest, Work next) = 0;
  // Ends the suspension. Nothing happens without one.
  virtual void resume() = 0;
};

enum class QualityOfService {
  UserInteractive,  // the server queue: on Linux it is served by the thread that also waits for the sockets
  UserInitiated,
  Utility,
  Background,
};

class WorkQueues {
 public:
  virtual ~WorkQueues() = default;
  // A new serial queue. Queues other than the user-interactive one share a small pool of threads, each keeping its own
  // order. Work that still waits when the last owner drops a queue is run all the same.
  virtual std::shared_ptr<WorkQueue> makeSerialQueue(std::string_view name, QualityOfService quality) = 0;
  // The same, for whoever waits on a queue of its own: a thousand waits cost no thread.
  virtual std::shared_ptr<SuspendableQueue> makeSuspendableQueue(std::string_view name, QualityOfService quality) = 0;
};

}  // namespace tarn::platform
