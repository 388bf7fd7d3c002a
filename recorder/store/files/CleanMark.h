// SPDX-License-Identifier: Apache-2.0
// CleanMark: that the database is as the last one left it who closed it in order, in this boot of the machine.
//
//   FILE.clean: the boot, the inode, the size and the time of the last change, one line
//
// Which problem: reading a large file through takes longer than all the rest of a start, and clients wait for that.
// How: who closes the file in order gives it a time of change that no later change has, to the nanosecond, and notes
// it. A file that still has it needs no second reading: nothing but a disk that forgets can have changed it since, and
// that is looked for while the service runs. The mark holds for one opening: who is killed leaves none.
//
// Owner: the EventFile. Threads: the writer's. Nothing fails: without a mark the file is read through.
#pragma once

#include <filesystem>
#include <string>

namespace tarn::recorder {

class CleanMark {
 public:
  // Of this database; an empty boot stands for an unknown one, for which nothing is marked.
  CleanMark(const std::filesystem::path& database, std::string boot);

  // Before the database is opened: whether it is as it was left. The mark is gone then.
  bool take() noexcept;
  // After it was closed in order, and while nobody else has its log open.
  void leave() noexcept;

 private:
  // What the mark of the file as it is would say; empty where there is no such file or its log holds something.
  std::string lineOfNow() const;

  const std::filesystem::path database_;
  const std::filesystem::path log_;
  const std::filesystem::path mark_;
  const std::string boot_;
};

}  // namespace tarn::recorder
