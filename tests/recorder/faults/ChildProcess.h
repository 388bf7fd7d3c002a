// SPDX-License-Identifier: Apache-2.0
// ChildProcess: runs a piece of a test in a process of its own, where limits and rights may be changed or the end may
// come at any moment. It ends with the test's process at the latest.
//
// It is begun before there is another thread: a lock that one holds at that moment, SQLite's own among them, would stay
// locked in the child for ever.
#pragma once

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <filesystem>
#include <functional>
#include <iterator>

#include "tests/support/HeapUse.h"

namespace tarn::recorder {

class ChildProcess {
 public:
  explicit ChildProcess(const std::function<void()>& body) : id_(forkAlone()) {
    if (id_ == 0) {
      ::prctl(PR_SET_PDEATHSIG, SIGKILL);
      body();
      ::_exit(::testing::Test::HasFailure() ? 1 : 0);
    }
  }
  ~ChildProcess() {
    if (id_ > 0) {
      killAndWait();
    }
  }
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;

  // The exit status: 0 when the body ended without a failed expectation.
  int wait() {
    int status = 0;
    ::waitpid(id_, &status, 0);
    id_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }
  void killAndWait() {
    ::kill(id_, SIGKILL);
    wait();
  }

 private:
  static pid_t forkAlone() {
#ifndef TARN_SANITIZED_HEAP  // a sanitizer may have a thread of its own
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator("/proc/self/task"), {}), 1);
#endif
    return ::fork();
  }

  pid_t id_;
};

// For a child: gives up the superuser's rights, to whom no file is read-only, and owns the directory as what it then
// is.
inline void becomeOrdinaryUser(const std::filesystem::path& directory) {
  constexpr uid_t kNobody = 65'534;
  if (::geteuid() != 0) return;
  ASSERT_EQ(::chown(directory.c_str(), kNobody, kNobody), 0);
  ASSERT_EQ(::setgid(kNobody), 0);
  ASSERT_EQ(::setuid(kNobody), 0);
}

}  // namespace tarn::recorder
