#include "tests/scenario/Recorded.h"

#include <chrono>
#include <stdexcept>
#include <thread>
#include <utility>

#include "plist/formats/Json.h"
#include "recorder/store/EventReader.h"

namespace tarn::scenario {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPause{20};

Clock::time_point deadlineIn(double seconds) {
  return Clock::now() + std::chrono::ceil<Clock::duration>(std::chrono::duration<double>(seconds));
}

}  // namespace

std::vector<RecordedEvent> recordedEvents(const std::string& stateDirectory) {
  std::vector<RecordedEvent> events;
  recorder::EventReader reader(stateDirectory + "/recorder.sqlite3");
  recorder::EventQuery query;
  recorder::EventReader::Result result;
  do {
    result = reader.read(query);
    if (result.status == recorder::EventReader::Status::Failed) {
      throw std::runtime_error("can't read the recorder: " + result.error);
    }
    for (const recorder::EventRow& row : result.rows) {
      events.push_back({row.id, row.time, row.backend, row.name, json::parse(row.payload), json::parse(row.detail)});
    }
    query.after = result.lookedUpTo;
  } while (result.more);
  return events;
}

ServiceWatch::ServiceWatch(const std::string& socket, double patienceSeconds) {
  const auto deadline = deadlineIn(patienceSeconds);
  while (!client_) {
    auto connected = client::TarnReportingClient::connect(socket);
    client_ = std::move(connected.client);
    if (!client_ && Clock::now() > deadline) {
      throw std::runtime_error("the service can't be reached: " + connected.error);
    }
    if (!client_) {
      std::this_thread::sleep_for(kPause);
    }
  }
}

json ServiceWatch::ledgerAtRest(double patienceSeconds, std::size_t leastEvents) {
  const auto deadline = deadlineIn(patienceSeconds);
  while (true) {
    const client::Reply reply = client_->call(client::status());
    if (!reply.ok()) {
      throw std::runtime_error("the service doesn't tell its status: " + reply.error.text);
    }
    std::string text;
    plist::appendJson(text, reply.dictionary());
    json ledger = json::parse(text);
    const bool isAtRest = ledger.value("queued", 1) == 0 && ledger.value("recorder_waiting", 1) == 0 &&
                          ledger.value("connections_open", 0) == 1;
    if (isAtRest && (ledger.value("recorder_committed", std::size_t{0}) >= leastEvents || Clock::now() > deadline)) {
      return ledger;
    }
    if (Clock::now() > deadline) {
      throw std::runtime_error("the service doesn't come to rest: " + ledger.dump());
    }
    std::this_thread::sleep_for(kPause);
  }
}

}  // namespace tarn::scenario
