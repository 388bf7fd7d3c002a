// SPDX-License-Identifier: Apache-2.0
// TarnReportingSignpost: the work of a scope, as performance traces show it.
//
//   const TarnReportingSignpost signpost(SignpostCategory::Worker, workerClass.name, "start");
//
// The interval begins here and ends with the scope. Subject, verb and the argument's name must be static (see
// platform/Signposts.h). While nothing records, setting one is a load and a branch that the processor foresees, and its
// end is a look at what the begin left in a register. Threads: any.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/Signposts.h"

namespace tarn {

using platform::SignpostCategory;

namespace detail {

// The switch of the installed facility, or one that is never on; kept here so that the test is one load and one branch.
// NOLINTNEXTLINE(cppcoreguidelines-avoid-non-const-global-variables)
extern const std::atomic<bool>* signpostSwitch;

// An interval that is being recorded.
struct OpenSignpost {
  platform::Signposts* signposts;
  platform::Signpost signpost;
  std::chrono::nanoseconds began;
};
// Only while the switch is on, which only an installed facility has.
std::optional<OpenSignpost> beginSignpost(const platform::Signpost& signpost) noexcept;

}  // namespace detail

// Lives on the stack and is never moved. An interval that began while nothing recorded leaves no trace, and the
// facility drops one whose trace has ended meanwhile.
class [[nodiscard]] TarnReportingSignpost {
 public:
  // Relaxed: a trace that starts right now may miss the intervals that begin in that instant, and loses nothing else.
  TarnReportingSignpost(SignpostCategory category, std::string_view subject, std::string_view verb,
                        platform::SignpostArgument argument = {}) noexcept {
    if (detail::signpostSwitch->load(std::memory_order_relaxed)) [[unlikely]] {
      open_ = detail::beginSignpost({category, subject, verb, argument});
    }
  }
  ~TarnReportingSignpost() {
    if (open_) [[unlikely]] {
      open_->signposts->end(open_->signpost, open_->began);
    }
  }
  TarnReportingSignpost(const TarnReportingSignpost&) = delete;
  TarnReportingSignpost& operator=(const TarnReportingSignpost&) = delete;

 private:
  std::optional<detail::OpenSignpost> open_;
};

}  // namespace tarn
