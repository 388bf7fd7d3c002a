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

// What the loop calls. Held by the loop while a descriptor of it is watched or a flush is due.
class EventHandler {
 public:
  virtual ~EventHandler() = default;
  // `events` as epoll tells them.
  virtual void handleEvents(std::uint32_t events) = 0;
  // Asked for with flushLater(); called once, after the turn's work.
  virtual void flush() {}
};

class MainLoop {
 public:
  // Something to look at once a turn, after the turn's work. Must be cheap.
  using TurnHook = platform::UniqueFunction<void()>;

  // The clock outlives the loop.
  explicit MainLoop(const platform::Clock& clock);
  MainLoop(const MainLoop&) = delete;
  MainLoop& operator=(const MainLoop&) = delete;
  ~MainLoop();

  // Whether the loop can run; it can't when the system had no descriptors left.
  const Status& setUp() const noexcept { return setUp_; }

  const std::shared_ptr<ServerQueue>& queue() const noexcept { return queue_; }
  QueueProgress& progress() noexcept { return progress_; }
  const platform::Clock& clock() const noexcept { return clock_; }

  // Calls the handler for these events of the descriptor until unwatch(). Fails when the system doesn't take it. A
  // descriptor is unwatched before it is closed. Without the memory for it nothing has changed.
  [[nodiscard]] Status watch(int descriptor, std::uint32_t events, std::shared_ptr<EventHandler> handler);
  void change(int descriptor, std::uint32_t events);
  void unwatch(int descriptor);

  // Calls handler->flush() once, before the loop waits for events. Needs no memory for one that asks once and whose
  // descriptor was watched: there is room for as many as there are descriptors.
  void flushLater(std::shared_ptr<EventHandler> handler) { flushes_.push_back(std::move(handler)); }
  // Flushes at once what waits for the turn's end, for a turn that has none because the process ends in it.
  void flushAll();
  void addTurnHook(TurnHook hook) { hooks_.push_back(std::move(hook)); }

  // Serves until stop(). Replies that are ready by then are flushed; work that waits then is left. What memory is
  // missing for ends where it began, as a piece of work, an event, a hook or a flush, and the next is served.
  void run();
  void stop();

  // For a piece of work that waits on purpose: until `isOver` or the deadline, handlers are called and flushes made as
  // ever, but no work is run. It ends early once the loop was stopped, and does nothing inside itself. `isOver` is
  // asked again after each event and each wake() of the queue.
  void waitUntil(std::chrono::nanoseconds deadline, platform::UniqueFunction<bool()> isOver);
  // Whether the queue's work waits in waitUntil().
  bool waits() const noexcept { return waits_; }

 private:
  struct Slot {
    std::shared_ptr<EventHandler> handler;
    std::uint32_t generation = 0;  // tells a watched descriptor from an earlier one of the same number
  };

  static constexpr int kEventsPerTurn = 128;
  using Events = std::array<epoll_event, kEventsPerTurn>;

  void waitForEvents();
  std::size_t sleep(Events& events, std::optional<std::chrono::nanoseconds> timeout);
  void dispatchAll(std::span<const epoll_event> events);
  void dispatch(std::uint64_t token, std::uint32_t events);

  const platform::Clock& clock_;
  QueueProgress progress_;
  std::shared_ptr<ServerQueue> queue_;
  UniqueDescriptor epoll_;
  Status setUp_;
  std::atomic<bool> stopping_{false};
  bool waits_ = false;

  std::vector<Slot> slots_;  // by descriptor
  std::vector<std::shared_ptr<EventHandler>> flushes_;
  std::vector<std::shared_ptr<EventHandler>> flushing_;
  std::vector<TurnHook> hooks_;
};

}  // namespace tarn::linux_host
