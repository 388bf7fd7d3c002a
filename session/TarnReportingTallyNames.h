// SPDX-License-Identifier: Apache-2.0
// TarnReportingTallyNames: under which two names the analytics events know a kind of message, formed once for all
// sessions.
//
// A session has few kinds of messages, and other sessions have the same ones; so the names are the process's, and a
// session pays for them with a pointer.
//
// Part of the process's state; tally workers share it. Threads: the server queue.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <unordered_map>

#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn {

class TarnReportingTallyNames {
 public:
  struct Names {
    std::string ofMessage;  // "sys.oxbow.tarnkit.%@.%@"
    std::string ofService;  // "sys.oxbow.%@.%@.%@"
  };

  // Formed on first use and kept. The reference holds until the next call.
  const Names& of(AudioServiceType serviceType, AudioEventCategory category, AudioEventType type);

 private:
  // More kinds than a device's engines have together; cleared when a client floods it.
  static constexpr std::size_t kLimit = 1024;

  std::unordered_map<std::uint64_t, Names> names_;
};

}  // namespace tarn
