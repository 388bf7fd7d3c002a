// SPDX-License-Identifier: Apache-2.0
// FileOutput: a log file that others may rotate away: when the file of this name has been renamed or removed, the next
// line begins a new one. Lines are appended, so that several processes may share the file. Threads: the log's own,
// after open().
//
// Before each line the name is looked up again (one stat), which is what makes rotation by renaming work without a
// signal. A name that isn't a file (a pipe, a terminal) is opened without waiting and then taken as an output that may
// stall. Owned by the QueuedLog.
#pragma once

#include <sys/types.h>

#include <string>

#include "host/log/LineOutput.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileOutput final : public LineOutput {
 public:
  // Opens nothing. A relative path is that of the working directory at each look.
  explicit FileOutput(std::string path);

  // Opens the file for appending, made with mode 0640 (less the process's mask) when it isn't there. Called before
  // anything is written, to learn early whether it can be; the error is that of open(2) and the file open so far stays.
  // Later it is called by descriptor(), whenever the name leads elsewhere.
  [[nodiscard]] Status open();

 private:
  // The file of this name now. When it can't be opened any more, a file that was only renamed still takes the line; one
  // that was removed would swallow it, so the error comes instead and the line is tried again later.
  int descriptor() override;

  const std::string path_;
  UniqueDescriptor file_;
  // Which file is open: device and inode tell a new file of the same name from it.
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace tarn::linux_host
