// SPDX-License-Identifier: Apache-2.0
// TopLoop: takes looks in turn and shows each, until somebody has seen enough. Threads: one.
#pragma once

#include <cstdint>

#include "tools/ctl/views/TopModel.h"
#include "tools/ctl/views/TopSample.h"

namespace tarn::ctl {

// Where views go, and how long is waited between two of them.
class TopScreen {
 public:
  TopScreen() = default;
  virtual ~TopScreen() = default;
  TopScreen(const TopScreen&) = delete;
  TopScreen& operator=(const TopScreen&) = delete;

  // False once nobody looks any more.
  virtual bool show(const TopView& view) = 0;
  // Waits for the next one; false when it was asked to end, or nobody looks any more.
  virtual bool pause() = 0;
};

// `count` views, or without end for 0. The exit status: unreachable when the service isn't there at the first look,
// which is complained of; later ends of the service are shown, and are no failure.
int runTop(TopSource& source, TopScreen& screen, std::uint64_t count);

}  // namespace tarn::ctl
