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
  explicit ChangeWatch(const std::filesystem::path& file);
  ~ChangeWatch();
  ChangeWatch(const ChangeWatch&) = delete;
  ChangeWatch& operator=(const ChangeWatch&) = delete;

  // Waits until something was written since the last call, or until the time is up; whether something was. A signal
  // ends it too.
  bool wait(std::chrono::microseconds timeout);

 private:
  void begin();
  bool takeNews();

  const std::string folder_;
  const std::string name_;
  int events_ = -1;  // the descriptor that they are read from
  int folderWatch_ = -1;
};

}  // namespace tarn::recorder
