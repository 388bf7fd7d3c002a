// Recorded: what the service says about itself and what its recorder holds.
#pragma once

#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "client/TarnReportingClient.h"

namespace tarn::scenario {

using nlohmann::json;

struct RecordedEvent {
  std::int64_t id = 0;
  double time = 0;
  std::string backend;
  std::string name;
  json payload;
  json detail;
};

// All events of the recorder, in the order of hand-over. Throws std::runtime_error.
std::vector<RecordedEvent> recordedEvents(const std::string& stateDirectory);

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
  std::unique_ptr<client::TarnReportingClient> client_;
};

}  // namespace tarn::scenario
