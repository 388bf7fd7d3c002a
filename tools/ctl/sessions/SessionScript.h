// SPDX-License-Identifier: Apache-2.0
// SessionScript: a session as a script that `tarnreportingctl run` plays to the same derived messages.
//
// Messages keep their stamps, so what is derived of them doesn't depend on when and how fast they are played; a service
// replaces stamps that are more than a year old. Each is as the workers got it, with its time stamp as a date where it
// was one. Messages that repeat one are in it where the recorder keeps them. What the service itself made (derived
// messages, drivers' counters) isn't, but the settings of the device are, since they are part of what was derived; so
// are the starts and stops between the messages. Stateless. Threads: any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "recorder/store/reading/SessionReader.h"
#include "tools/ctl/sessions/SessionMessage.h"

namespace tarn::ctl {

struct SessionScript {
  std::vector<std::string> lines;  // of JSON
  // Events whose messages no script can say: a dictionary that would read as a date, a category without a name.
  std::vector<std::int64_t> leftOut;
  std::size_t unknownRepeated = 0;  // repeated messages that are left out, since nothing tells what they said
};

// `messages` in the order in which they were handed over, `periods` and `repeated` in theirs.
SessionScript scriptOf(const recorder::SessionRow& session, const std::vector<recorder::PeriodRow>& periods,
                       const std::vector<SessionMessage>& messages,
                       const std::vector<recorder::RepeatedRow>& repeated = {});

}  // namespace tarn::ctl
