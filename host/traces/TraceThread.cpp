#include "host/traces/TraceThread.h"

#include <pthread.h>

#include <system_error>
#include <utility>

namespace tarn::linux_host {

bool TraceThread::run() {
  const std::lock_guard lock(mutex_);
  if (ended_) return false;
  if (thread_.joinable()) return true;
  try {
    thread_ = std::thread([this] { work(); });
  } catch (const std::system_error&) {
    return false;  // the machine has no thread left
  }
  ::pthread_setname_np(thread_.native_handle(), "traces");
  return true;
}

void TraceThread::post(Verb verb, std::shared_ptr<TraceRecording> recording) {
  const std::lock_guard lock(mutex_);
  if (ended_) return;
  commands_.push_back({verb, std::move(recording)});
  changed_.notify_one();
}

void TraceThread::end() {
  std::thread thread;
  {
    const std::lock_guard lock(mutex_);
    ended_ = true;
    thread = std::move(thread_);
    changed_.notify_one();
  }
  if (thread.joinable()) thread.join();
}

void TraceThread::work() {
  std::unique_lock lock(mutex_);
  for (;;) {
    waitForWork(lock);
    const std::vector<Command> commands = std::exchange(commands_, {});
    if (ended_) break;
    lock.unlock();
    for (const Command& command : commands) {
      carryOut(command);
    }
    for (const auto& recording : open_) {
      recording->drain();
    }
    lock.lock();
  }
  lock.unlock();
  for (const auto& recording : std::exchange(open_, {})) {
    recording->release();
    recording->discard();
  }
}

void TraceThread::waitForWork(std::unique_lock<std::mutex>& lock) {
  const auto hasWork = [this] { return ended_ || mustDrain_ || !commands_.empty(); };
  if (open_.empty()) {
    changed_.wait(lock, hasWork);
  } else {
    changed_.wait_for(lock, limits_.drainInterval, hasWork);
  }
  mustDrain_ = false;
}

void TraceThread::carryOut(const Command& command) {
  TraceRecording& recording = *command.recording;
  switch (command.verb) {
    case Verb::Start:
      recording.start(open_.size() < limits_.mostTraces, [this] { wake(); });
      if (recording.isOpen()) open_.push_back(command.recording);
      return;
    case Verb::Stop:
      recording.stop();
      break;
    case Verb::Release:
      recording.discard();
      break;
  }
  std::erase(open_, command.recording);
}

void TraceThread::wake() {
  const std::lock_guard lock(mutex_);
  mustDrain_ = true;
  changed_.notify_one();
}

}  // namespace tarn::linux_host
