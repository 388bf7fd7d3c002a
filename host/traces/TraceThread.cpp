// SPDX-License-Identifier: Apache-2.0
#include "host/traces/TraceThread.h"

#include <pthread.h>

#include <system_error>
#include <utility>

#include "host/system/MemoryReserve.h"

namespace tarn::linux_host {

bool TraceThread::run() {
  const MutexLock lock(mutex_);
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
  const MutexLock lock(mutex_);
  if (ended_) return;
  commands_.push_back({verb, std::move(recording)});
  changed_.notifyOne();
}

void TraceThread::end() {
  std::thread thread;
  {
    const MutexLock lock(mutex_);
    ended_ = true;
    thread = std::move(thread_);
    changed_.notifyOne();
  }
  if (thread.joinable()) {
    thread.join();
  }
}

void TraceThread::work() {
  mutex_.lock();
  for (;;) {
    waitForWork();
    const std::vector<Command> commands = std::exchange(commands_, {});
    if (ended_) break;
    mutex_.unlock();
    for (const Command& command : commands) {
      MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { carryOut(command); });
    }
    for (const auto& recording : open_) {
      MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, [&] { recording->drain(); });
    }
    mutex_.lock();
  }
  mutex_.unlock();
  for (const auto& recording : std::exchange(open_, {})) {
    recording->release();
    recording->discard();
  }
}

void TraceThread::waitForWork() {
  const auto hasWork = [this]() TARN_REQUIRES(mutex_) { return ended_ || mustDrain_ || !commands_.empty(); };
  if (open_.empty()) {
    changed_.wait(mutex_, hasWork);
  } else {
    changed_.waitFor(mutex_, limits_.drainInterval, hasWork);
  }
  mustDrain_ = false;
}

void TraceThread::carryOut(const Command& command) {
  TraceRecording& recording = *command.recording;
  switch (command.verb) {
    case Verb::Start:
      recording.start(open_.size() < limits_.mostTraces, [this] { wake(); });
      if (recording.isOpen()) {
        open_.push_back(command.recording);
      }
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
  const MutexLock lock(mutex_);
  mustDrain_ = true;
  changed_.notifyOne();
}

}  // namespace tarn::linux_host
