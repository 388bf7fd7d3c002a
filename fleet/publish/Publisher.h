// SPDX-License-Identifier: Apache-2.0
// Publisher: where messages go. All that the exporter knows of it stands on this page, so that another kind of server
// is another class.
//
//   publish(7, id, bytes) -> ... wait() -> {7, ok}       it has arrived and stays there
//                                       -> {7, error}    it may have arrived or not: publish it again
//                                       -> nothing       the same, after a while
//   asked() -> ids to read and publish again: who has the messages lacks them
//
// A message that is published again has the same id and the same bytes, so who gets it twice can tell. Threads: one at
// a time; what it does on others is its own.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "plist/Result.h"
#include "recorder/store/retention/IdRange.h"

namespace tarn::fleet {

// What became of one try.
struct Outcome {
  std::uint64_t number = 0;
  Status status;
};

class Publisher {
 public:
  virtual ~Publisher() = default;

  // Begins to send; waits for a connection at most. The error: it isn't taken now, and no outcome comes of it.
  [[nodiscard]] virtual Status publish(std::uint64_t number, const std::string& id, const std::string& bytes) = 0;
  // Waits until there is an outcome or the time is up, and appends those that are known.
  virtual void wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) = 0;
  // Whether somebody there misses what is lost and asks for it again.
  virtual bool hasAsker() const { return false; }
  // Appends the ranges of ids that were asked for since the last call, in any order. They are whoever's words: the
  // device may have them or not.
  virtual void asked(std::vector<recorder::IdRange>& /*ranges*/) {}
};

}  // namespace tarn::fleet
