// SPDX-License-Identifier: Apache-2.0
#include "host/machine/LinuxRandomSource.h"

#include <sys/random.h>

#include <cerrno>
#include <cstdlib>

namespace tarn::linux_host {

namespace {

// So few bytes always come whole; a signal can only get in while the kernel gathers its first entropy after boot.
std::uint64_t randomWord() {
  std::uint64_t word = 0;
  while (::getrandom(&word, sizeof word, 0) != static_cast<ssize_t>(sizeof word)) {
    if (errno != EINTR) {
      std::abort();
    }  // a kernel that has no random numbers: nothing that we could do about it
  }
  return word;
}

}  // namespace

std::uint64_t LinuxRandomSource::below(std::uint64_t bound) {
  if (bound == 0) return 0;
  // 2^64 is rarely a multiple of the bound; the words of the incomplete round at the bottom are drawn again.
  const std::uint64_t unusable = (0 - bound) % bound;
  std::uint64_t word = randomWord();
  while (word < unusable) {
    word = randomWord();
  }
  return word % bound;
}

}  // namespace tarn::linux_host
