// SPDX-License-Identifier: Apache-2.0
// SessionMessages: messages for the tests of what is made of them.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "tools/ctl/sessions/SessionMessage.h"

namespace tarn::ctl {

// A message of the kind CATEGORY.TYPE that was stamped and handed over at the same time.
inline SessionMessage messageAt(double at, const std::string& kind, const std::string& members = {},
                                std::int64_t event = 1) {
  std::string payload = "{\"tarnreporting_timestamp\":";
  payload.append(std::to_string(at)).append(members.empty() ? "" : "," + members).append("}");
  const auto message = messageOf({event, at, "tally", "sys.oxbow.tarnkit." + kind, payload, "{}"});
  EXPECT_TRUE(message.has_value()) << payload;
  return message.value_or(SessionMessage());
}

}  // namespace tarn::ctl
