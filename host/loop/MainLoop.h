// SPDX-License-Identifier: Apache-2.0
// MainLoop: the one loop of the process. The thread that runs it serves the server queue and waits for the sockets, so
// that a request and its reply never cross a thread.
//
//   one turn:  run waiting work (a bounded number of pieces) -> turn hooks -> flushes -> epoll_wait -> event handlers
//
// A round trip of a lone client is therefore three system calls: epoll_wait, recv, send. Work and sockets take turns,
// so neither starves the other; a piece of work that blocks holds up the sockets, which slows clients and loses
// nothing. A piece that waits on purpose serves them meanwhile, with waitUntil().
//
// Owned by the platform; outlives what it watches. Threads: stop() and the queue any; the rest only the loop's
// thread (or before run()).
#pragma once

#include <sys/epoll.h>

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <vector>

#include "host/loop/QueueProgress.h"
#include "host/loop/ServerQueue.h"
#include "host/system/UniqueDescriptor.h"
#include "platform/Clock.h"
#include "plist/Result.h"

namespace tarn::linux_host {

// What the loop calls: a listener, a connection, the signals. Held by the loop while a descriptor of it is watched or a
// flush is due, so it may let go of itself in the middle of a call. Only ever called on the loop's thread.
class EventHandler {
 public:
  virtual ~EventHandler() = default;
  // `events` as epoll tells them (EPOLLIN, EPOLLOUT, EPOLLHUP, ...). May watch, change and unwatch descriptors, its own
  // included; must not block. Several events of one look may be for one handler.
  virtual void handleEvents(std::uint32_t events) = 0;
  // Asked for with flushLater(); called as often as it was asked for, after the turn's work. What many replies of one
  // turn need one system call for stands here. Asked for by a flush, it comes in the next turn, which then doesn't
  // sleep.
  virtual void flush() {}
};

class MainLoop {
 public:
  // Something to look at once a turn, after the turn's work and before the flushes. Must be cheap: a busy service has
  // many turns, and each pays for it.
  using TurnHook = platform::UniqueFunction<void()>;

  // The clock outlives the loop. Makes the queue and its two descriptors (epoll, wake-up); setUp() tells whether there
  // were any.
  explicit MainLoop(const platform::Clock& clock);
  MainLoop(const MainLoop&) = delete;
  MainLoop& operator=(const MainLoop&) = delete;
  ~MainLoop();

  // Whether the loop can run; it can't when the system had no descriptors left. To be asked before run().
  const Status& setUp() const noexcept { return setUp_; }

  // The same one for the loop's whole life. Others may hold it longer; then it takes work that nobody runs.
  const std::shared_ptr<ServerQueue>& queue() const noexcept { return queue_; }
  // For the watchdog, and for whoever waits on purpose.
  QueueProgress& progress() noexcept { return progress_; }
  const platform::Clock& clock() const noexcept { return clock_; }

  // Calls the handler for these events of the descriptor until unwatch(). Fails when the system doesn't take it. A
  // descriptor is unwatched before it is closed. Without the memory for it nothing has changed.
  [[nodiscard]] Status watch(int descriptor, std::uint32_t events, std::shared_ptr<EventHandler> handler);
  // Waits for these events from now on instead; 0 leaves only errors and hang-ups. Only of a watched descriptor. A call
  // to the system, so callers remember what they asked for.
  void change(int descriptor, std::uint32_t events);
  // No handler is called for it any more, not even for events that this look has already brought. The handler may be
  // destroyed by this call.
  void unwatch(int descriptor);

  // Calls handler->flush() once, before the loop waits for events. Needs no memory for one that asks once and whose
  // descriptor was watched: there is room for as many as there are descriptors.
  void flushLater(std::shared_ptr<EventHandler> handler) { flushes_.push_back(std::move(handler)); }
  // Flushes at once what waits for the turn's end, for a turn that has none because the process ends in it.
  void flushAll();
  // In the order in which they were added. Before run(); there is no way to take one out, so what it looks at outlives
  // the loop's last turn.
  void addTurnHook(TurnHook hook) { hooks_.push_back(std::move(hook)); }

  // Serves until stop(). Replies that are ready by then are flushed; work that waits then is left. What memory is
  // missing for ends where it began, as a piece of work, an event, a hook or a flush, and the next is served.
  void run();
  // Ends run() after the turn that it is in, and waitUntil() at its next look. Any thread; once stopped a loop doesn't
  // run again. Not for signal handlers: it takes the queue's lock.
  void stop();

  // For a piece of work that waits on purpose: until `isOver` or the deadline, handlers are called and flushes made as
  // ever, but no work is run. It ends early once the loop was stopped, and does nothing inside itself. `isOver` is
  // asked again after each event and each wake() of the queue, and after such a one the hooks look once more when it is
  // over.
  void waitUntil(std::chrono::nanoseconds deadline, platform::UniqueFunction<bool()> isOver);
  // Whether the queue's work waits in waitUntil().
  bool waits() const noexcept { return waits_; }

 private:
  // One for each descriptor number, of which the highest bounds the table; a slot is used again with its number.
  struct Slot {
    std::shared_ptr<EventHandler> handler;
    std::uint32_t generation = 0;  // tells a watched descriptor from an earlier one of the same number
  };

  // How many descriptors one look tells of. What is ready beyond that comes with the next look; the kernel goes round,
  // so nobody is left out.
  static constexpr int kEventsPerTurn = 128;
  using Events = std::array<epoll_event, kEventsPerTurn>;

  // The last part of a turn: sleeps as long as the queue and the flushes allow and calls the handlers.
  void waitForEvents();
  // In whole milliseconds, rounded up; an hour at the most when it has an end at all. A signal ends it with no events.
  std::size_t sleep(Events& events, std::optional<std::chrono::nanoseconds> timeout);
  void dispatchAll(std::span<const epoll_event> events);
  // `token` is the descriptor and its slot's generation, as watch() gave them to epoll. An event whose generation has
  // passed is of a descriptor that was closed in this same look, and is dropped.
  void dispatch(std::uint64_t token, std::uint32_t events);

  const platform::Clock& clock_;
  QueueProgress progress_;
  std::shared_ptr<ServerQueue> queue_;
  UniqueDescriptor epoll_;
  Status setUp_;
  std::atomic<bool> stopping_{false};
  // Keeps a wait within a wait, from a handler that is called in the first, from beginning.
  bool waits_ = false;

  std::vector<Slot> slots_;  // by descriptor
  std::vector<std::shared_ptr<EventHandler>> flushes_;
  // The flushes that are made now, apart from those that they ask for; a member so that its room is kept.
  std::vector<std::shared_ptr<EventHandler>> flushing_;
  std::vector<TurnHook> hooks_;
};

}  // namespace tarn::linux_host
