// SPDX-License-Identifier: Apache-2.0
// SessionTimeline: what a session did, from its messages: when its output and input ran, on which devices, how loud,
// and what went wrong. Stateless. Threads: any.
#pragma once

#include <string>
#include <vector>

#include "tools/ctl/sessions/SessionMessage.h"

namespace tarn::ctl {

// All times are the messages' own stamps, in epoch seconds. Messages count in the order of these, and those that the
// service derived don't count.
struct SessionTimeline {
  struct Span {
    double from = 0;
    double to = 0;
    std::string text;  // the devices of a route
  };
  struct Level {
    double at = 0;
    double value = 0;
  };
  struct Mark {
    double at = 0;
    std::string text;
  };

  double first = 0;
  double last = 0;
  // What still ran at the end ends with the last message.
  std::vector<Span> output;
  std::vector<Span> input;
  std::vector<Span> routes;
  std::vector<Level> volumes;  // its changes
  std::vector<Mark> overloads;
  std::vector<Mark> errors;  // errors and issues (report::MessageKind)
  // What changed, a line each: "output runs, route Speaker, volume 0.5".
  std::vector<Mark> steps;
};

SessionTimeline timelineOf(const std::vector<SessionMessage>& messages);

}  // namespace tarn::ctl
