// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingSignpost.h"

#include "platform/Facilities.h"
#include "service/vocabulary/TarnReportingPlatform.h"

namespace tarn::detail {

std::optional<OpenSignpost> beginSignpost(const platform::Signpost& signpost) noexcept {
  platform::Signposts* const signposts = TarnReportingFacilities().signposts;
  return OpenSignpost{signposts, signpost, signposts->begin()};
}

}  // namespace tarn::detail
