// SPDX-License-Identifier: Apache-2.0
// Recorded: what the service says about itself, what its recorder holds and the files that it leaves for people.
#pragma once

#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "client/ClientConnection.h"

namespace tarn::scenario {

using nlohmann::json;

// The stand-ins for back-ends of what no recorder holds:
constexpr const char* kSummaryFiles = "file";  // an event for each file: the payload is its content
constexpr const char* kReplies = "client";     // an event for each reply that a script got, named for its line

struct RecordedEvent {
  std::int64_t id = 0;
  std::string backend;
  std::string name;
  json payload;
  json detail = json::object();
  std::string script{};  // that led to it; empty when that isn't known
};

// All events of the recorder after number `after`, in the order of hand-over. Throws std::runtime_error.
std::vector<RecordedEvent> recordedEvents(const std::string& stateDirectory, std::int64_t after = 0);
// The summary files below the service's state directory; those of one session are in the order of its stops. Time and
// number aren't in the name; that of a file that is not named as it must be is left as it is.
std::vector<RecordedEvent> summaryFiles(const std::string& stateDirectory);
// What the client that played `script` printed, in the order of the lines: a reply may be held for long.
std::vector<RecordedEvent> repliesTo(const std::string& script, const std::string& outputPath);

// The service that is watched, over one connection that stays open meanwhile: an end of it would be recorded too.
// Throws std::runtime_error when the service doesn't answer as it should. Threads: one.
class ServiceWatch {
 public:
  // Waits until the service accepts, at most so long.
  ServiceWatch(const std::string& socket, double patienceSeconds);

  // Waits until the service has served and committed everything, so many events at least, and no client is connected
  // but this one; at most so long. The ledger then. Events that never come are no failure here: what is missing is told
  // by the comparison.
  json ledgerAtRest(double patienceSeconds, std::size_t leastEvents = 0);

 private:
  std::unique_ptr<client::ClientConnection> client_;
};

}  // namespace tarn::scenario
