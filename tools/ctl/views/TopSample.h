// SPDX-License-Identifier: Apache-2.0
// TopSample: one look at the service and at its store, and where looks come from. Threads: one.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "plist/Dictionary.h"

namespace tarn::ctl {

// A session that is open now.
struct OpenSession {
  std::int64_t id = 0;
  std::int64_t reporter = 0;
  std::int64_t pid = 0;
  std::string process;
  std::string application;
  std::string serviceName;
  double created = 0;                       // epoch seconds
  std::optional<std::int64_t> newMessages;  // recorded since the look before; nothing at the first one
  std::string lastMessage;                  // its name, empty for none that is known
  std::optional<double> lastTime;           // epoch seconds
  friend bool operator==(const OpenSession&, const OpenSession&) = default;
};

struct TopSample {
  double steady = 0;  // seconds of a clock that nobody sets, to tell how long ago the look before was
  double time = 0;    // epoch seconds
  std::optional<plist::Dictionary> status;  // what the service says of itself, nothing when it doesn't
  std::string whyNot;                       // why it doesn't
  std::vector<OpenSession> sessions;
  std::string storeTrouble;  // why the sessions aren't known; empty when they are
};

// Takes a look. Owned by whoever starts the view; it may block as long as the service may take to answer.
class TopSource {
 public:
  TopSource() = default;
  virtual ~TopSource() = default;
  TopSource(const TopSource&) = delete;
  TopSource& operator=(const TopSource&) = delete;

  virtual TopSample look() = 0;
};

}  // namespace tarn::ctl
