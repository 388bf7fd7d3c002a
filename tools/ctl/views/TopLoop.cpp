// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/TopLoop.h"

#include <utility>

#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

int runTop(TopSource& source, TopScreen& screen, std::uint64_t count) {
  TopSample before = source.look();
  if (!before.status) {
    complain(before.whyNot);
    return kUnreachable;
  }
  bool isSeen = screen.show(topView(before, nullptr));
  for (std::uint64_t shown = 1; isSeen && shown != count && screen.pause(); ++shown) {
    TopSample now = source.look();
    isSeen = screen.show(topView(now, &before));
    before = std::move(now);
  }
  return kSuccess;
}

}  // namespace tarn::ctl
