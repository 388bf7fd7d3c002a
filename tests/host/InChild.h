// SPDX-License-Identifier: Apache-2.0
// inChild: runs something in a child process, for what a process can do only once (environment, signals).
#pragma once

#include <sys/wait.h>
#include <unistd.h>

namespace tarn::testing {

// What `body` returned in the child, or -1 when the child did not get so far.
template <class Body>
int inChild(Body body) {
  const pid_t child = ::fork();
  if (child == 0) {
    ::_exit(body());
  }
  int status = 0;
  if (child < 0 || ::waitpid(child, &status, 0) != child || !WIFEXITED(status)) return -1;
  return WEXITSTATUS(status);
}

}  // namespace tarn::testing
