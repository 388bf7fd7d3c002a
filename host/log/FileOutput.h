// FileOutput: a log file that others may rotate away: when the file of this name has been renamed or removed, the next
// line begins a new one. Lines are appended, so that several processes may share the file. Threads: the log's own,
// after open().
#pragma once

#include <sys/types.h>

#include <string>

#include "host/log/LineOutput.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/Result.h"

namespace tarn::linux_host {

class FileOutput final : public LineOutput {
 public:
  explicit FileOutput(std::string path);

  // Opens the file, made with mode 0640 when it isn't there. Called before anything is written, to learn early whether
  // it can be.
  [[nodiscard]] Status open();

 private:
  int descriptor() override;

  const std::string path_;
  UniqueDescriptor file_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace tarn::linux_host
