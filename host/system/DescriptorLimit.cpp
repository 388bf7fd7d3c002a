// SPDX-License-Identifier: Apache-2.0
#include "host/system/DescriptorLimit.h"

#include <sys/resource.h>

#include <algorithm>

namespace tarn::linux_host {

namespace {

constexpr std::size_t kOwnDescriptors = 64;
// When the system doesn't tell.
constexpr std::size_t kUsualLimit = 1024;

}  // namespace

std::size_t raiseDescriptorLimit() noexcept {
  rlimit limit{};
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return kUsualLimit;
  rlimit raised = limit;
  raised.rlim_cur = raised.rlim_max;
  if (::setrlimit(RLIMIT_NOFILE, &raised) != 0) {
    raised = limit;
  }
  return static_cast<std::size_t>(raised.rlim_cur);
}

std::size_t connectionsWithin(std::size_t descriptorLimit) noexcept {
  return descriptorLimit > 2 * kOwnDescriptors ? descriptorLimit - kOwnDescriptors
                                               : std::max<std::size_t>(descriptorLimit / 2, 1);
}

}  // namespace tarn::linux_host
