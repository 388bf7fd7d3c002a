// SPDX-License-Identifier: Apache-2.0
// ScriptPlayer: plays scripts against a service, each in a client process of its own.
//
// Threads: one.
#pragma once

#include <string>
#include <vector>

#include "tests/scenario/Recorded.h"
#include "tests/scenario/ScriptProcess.h"

namespace tarn::scenario {

class ScriptPlayer {
 public:
  // "@DIRECTORY@" in scripts stands for `directory`.
  ScriptPlayer(Service service, std::string directory);
  ~ScriptPlayer();
  ScriptPlayer(const ScriptPlayer&) = delete;
  ScriptPlayer& operator=(const ScriptPlayer&) = delete;

  // Starts all of them, then waits for all. Whether every one succeeded; tells the complaints of one that didn't.
  bool play(const std::vector<std::string>& scripts);
  // All of a script that was played.
  std::vector<RecordedEvent> replies(const std::string& script) const;
  // The messages that a script sends.
  std::size_t messagesOf(const std::string& script) const;

 private:
  const Service service_;
  const std::string directory_;
  std::string copies_;  // a temporary directory
};

// With "@DIRECTORY@" for the name of the directory, as expectations have it.
std::vector<RecordedEvent> withoutDirectory(std::vector<RecordedEvent> events, const std::string& directory);

}  // namespace tarn::scenario
