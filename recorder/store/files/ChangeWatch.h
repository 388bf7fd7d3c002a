// SPDX-License-Identifier: Apache-2.0
// ChangeWatch: wakes whoever reads along as soon as somebody writes to a file or beside it under a name that begins
// with the file's.
//
// Which problem: looking again and again is either dear or late. How: the system tells what happens in the folder
// (inotify). Where it doesn't, as there are no watches left or the folder isn't there yet, a wait lasts its time, so
// callers look at times by themselves. Owner: a reader. Threads: one at a time.
#pragma once

#include <chrono>
#include <filesystem>
#include <string>

namespace tarn::recorder {

class ChangeWatch {
 public:
  // Looks at nothing yet. The file need not be there; its folder is watched, so that a file that is made later is seen
  // too.
  explicit ChangeWatch(const std::filesystem::path& file);
  ~ChangeWatch();
  ChangeWatch(const ChangeWatch&) = delete;
  ChangeWatch& operator=(const ChangeWatch&) = delete;

  // Waits until something was written since the last call, or until the time is up; whether something was. A signal
  // ends it too. What was written need not be a commit: its log and index count. The watch begins with the first call,
  // so what came before that isn't told.
  bool wait(std::chrono::microseconds timeout);

 private:
  // Makes what is missing of the watch, at each wait: the folder may have come back.
  void begin();
  // False for what is about other files of the folder.
  bool takeNews();

  // What is watched, and how the names begin that count.
  const std::string folder_;
  const std::string name_;
  // -1 while the system gives none; closed at the end.
  int events_ = -1;  // the descriptor that they are read from
  // -1 while the folder isn't watched.
  int folderWatch_ = -1;
};

}  // namespace tarn::recorder
