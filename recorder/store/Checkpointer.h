// SPDX-License-Identifier: Apache-2.0
// Checkpointer: brings the write-ahead log into the database on a thread and a connection of its own.
//
// Which problem: what stands in the log is copied and synchronised for tens of milliseconds, once for some megabytes;
// on the writer's thread all that comes in meanwhile would wait for it. How: SQLite lets one connection commit while
// another one copies. It ends as far as the log went when it began, so the log begins anew only when nothing was
// committed in the meantime, and whoever must have that does the rest on the writer's thread, which is then little.
//
// What fails here is tried again by the writer, whose error is the one that counts. Owner: the event file. Threads:
// the writer's.
#pragma once

#include <string>
#include <thread>

#include "plist/ThreadSafety.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

class Checkpointer {
 public:
  Checkpointer() = default;
  ~Checkpointer() { close(); }
  Checkpointer(const Checkpointer&) = delete;
  Checkpointer& operator=(const Checkpointer&) = delete;

  // Gets ready for a file that the writer has open, with a connection of its own; what fails shows in begin(). A file
  // from before is let go of.
  void open(const std::string& file);
  // Begins to bring the log in unless that is under way, and returns at once. False when the writer must do it: no
  // connection, no thread, or the last one failed.
  [[nodiscard]] bool begin();
  // How many pages the log had when the last one was over and had brought all of it in; 0: it hadn't, or none is over.
  // Told once. With as many pages in the log now, nothing was committed since.
  int takeBroughtIn();
  // Blocks until none is under way.
  void finish();
  // The same, ends the thread and lets go of the file. open() may follow.
  void close() noexcept;

 private:
  // The thread exists from the first checkpoint on: a small recorder never needs it.
  [[nodiscard]] bool startThread();
  // The thread: one checkpoint for each begin().
  void run();

  std::thread thread_;
  Connection connection_;  // while busy_, the thread's
  // Not held during a checkpoint, so the writer is never kept waiting by one that it doesn't wait for.
  Mutex mutex_;
  ConditionVariable changed_;
  // A checkpoint is under way, or about to be.
  bool busy_ TARN_GUARDED_BY(mutex_) = false;
  // The last one, by anything but a reader in the way; told to the next begin() once.
  bool failed_ TARN_GUARDED_BY(mutex_) = false;
  // Pages; see takeBroughtIn().
  int broughtIn_ TARN_GUARDED_BY(mutex_) = 0;
  bool stopping_ TARN_GUARDED_BY(mutex_) = false;
};

}  // namespace tarn::recorder
