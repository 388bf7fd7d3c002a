// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/Checkpointer.h"

#include <sched.h>
#include <sqlite3.h>
#include <sys/resource.h>

#include <exception>
#include <utility>

namespace tarn::recorder {

namespace {

constexpr int kBack = 10;

// The thread has the rank of the writer, which made it and goes ahead of the others. What it does for long may wait for
// all of them.
void standBack() {
  const int policy = ::sched_getscheduler(0);
  sched_param rank{};
  if (policy == SCHED_OTHER) {
    static_cast<void>(::setpriority(PRIO_PROCESS, 0, ::getpriority(PRIO_PROCESS, 0) + kBack));
  } else if (::sched_getparam(0, &rank) == 0 && rank.sched_priority > ::sched_get_priority_min(policy)) {
    --rank.sched_priority;
    static_cast<void>(::sched_setparam(0, &rank));
  }
}

}  // namespace

void Checkpointer::open(const std::string& file) {
  close();
  int code = connection_.open(file, SQLITE_OPEN_READWRITE);
  if (code == SQLITE_OK) {
    code = connection_.run("PRAGMA synchronous=FULL; PRAGMA trusted_schema=OFF");
  }
  // The first reading access opens the log, which must be the writer's.
  if (code != SQLITE_OK || !connection_.integer("SELECT count(*) FROM sqlite_schema")) {
    connection_.close();
  }
}

bool Checkpointer::begin() {
  if (!connection_.isOpen()) return false;
  const MutexLock lock(mutex_);
  if (busy_) return true;
  if (std::exchange(failed_, false) || !startThread()) return false;
  busy_ = true;
  changed_.notifyAll();
  return true;
}

bool Checkpointer::startThread() {
  if (thread_.joinable()) return true;
  try {
    thread_ = std::thread([this] { run(); });
  } catch (const std::exception&) {
    return false;  // no thread can be had
  }
  return true;
}

int Checkpointer::takeBroughtIn() {
  const MutexLock lock(mutex_);
  return std::exchange(broughtIn_, 0);
}

void Checkpointer::finish() {
  const MutexLock lock(mutex_);
  changed_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return !busy_; });
}

void Checkpointer::close() noexcept {
  if (thread_.joinable()) {
    {
      const MutexLock lock(mutex_);
      stopping_ = true;
      changed_.notifyAll();
    }
    thread_.join();
    const MutexLock lock(mutex_);
    stopping_ = failed_ = false;
    broughtIn_ = 0;
  }
  connection_.close();
}

void Checkpointer::run() {
  standBack();
  mutex_.lock();
  for (;;) {
    changed_.wait(mutex_, [this]() TARN_REQUIRES(mutex_) { return busy_ || stopping_; });
    if (!busy_) break;
    mutex_.unlock();
    int inLog = 0;
    int broughtIn = 0;
    const int code =
        sqlite3_wal_checkpoint_v2(connection_.handle(), nullptr, SQLITE_CHECKPOINT_PASSIVE, &inLog, &broughtIn);
    mutex_.lock();
    broughtIn_ = code == SQLITE_OK && inLog == broughtIn ? broughtIn : 0;
    failed_ = code != SQLITE_OK && (code & 0xFF) != SQLITE_BUSY;  // a reader in the way is no fault
    busy_ = false;
    changed_.notifyAll();
  }
  mutex_.unlock();
}

}  // namespace tarn::recorder
