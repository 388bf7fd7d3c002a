// SPDX-License-Identifier: Apache-2.0
// RingFixture: a board of rings on a loop that runs, with owners that note what they are asked for.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <vector>

#include "host/ring/RingBoard.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/loop/RunningLoop.h"
#include "tests/host/ring/ClientRing.h"

namespace tarn::testing {

// On the loop's thread, but for what is atomic.
class NotingOwner : public linux_host::RingOwner {
 public:
  explicit NotingOwner(linux_host::MainLoop& loop) : loop_(loop) {}
  bool takesRingRequests() override { return takes; }
  bool mayAskFor(wire::Operation operation) const noexcept override { return operation != refuses; }
  void serveRingRequest(wire::DecodedRequest& request) override {
    if (hasNoMemory) throw std::bad_alloc();
    if (watched != nullptr) {
      takenThen.push_back(ring::SharedWords::loadAcquire(&watched->taken_messages));
    }
    requests.push_back(request);
    ++count;
  }
  bool serveRingMessages(platform::MessageRun& run) override {
    if (!takesRuns) return false;
    leftOfRun = mostOfRun;
    runs.push_back(0);
    while (const platform::MessageRun::Message* const message = run.next()) {
      ++runs.back();
      wire::DecodedRequest request;
      request.operation = wire::Operation::SendMessage;
      request.dictionary = message->payload->dictionary();
      request.category = message->category;
      request.type = message->type;
      request.reporterIDs = std::vector<std::int64_t>{message->reporterID};
      try {
        serveRingRequest(request);
      } catch (const std::bad_alloc&) {
        return true;  // as the queue gives up the piece of work
      }
    }
    return true;
  }
  bool takesMoreOfTheRun() override { return takes && --leftOfRun > 0; }
  void countRingMessage() override { ++announced; }
  void workOffRingRequest() override { workedOff.push_back(requests.size()); }
  void afterRingRequests(platform::Work work) override { loop_.queue()->async(std::move(work)); }
  std::string description() const override { return "connection 1 of process 2"; }

  std::atomic<bool> takes{true};
  std::atomic<bool> hasNoMemory{false};
  std::atomic<std::size_t> count{0};
  bool takesRuns = true;
  std::optional<wire::Operation> refuses;
  std::int64_t mostOfRun = 1'000'000;  // messages of one run
  std::vector<std::size_t> runs;       // messages of each
  std::size_t announced = 0;           // messages of runs
  std::vector<wire::DecodedRequest> requests;
  std::vector<std::size_t> workedOff;  // so many requests had come each time
  // A ring, and how many of its messages were taken by its header when each request came.
  const tarnring_header* watched = nullptr;
  std::vector<std::uint64_t> takenThen;

 private:
  linux_host::MainLoop& loop_;
  std::int64_t leftOfRun = 0;
};

class RingFixture : public ::testing::Test {
 protected:
  using Opened = Result<std::uint64_t>;

  // `limits` and the recorder are set before.
  void start() {
    board_ = std::make_unique<linux_host::RingBoard>(running_.loop, log_, limits);
    board_->setCommitSource([this] {
      return linux_host::CommitPoint{handedOver.load(), committed.load(), settled.load()};
    });
    owner_ = std::make_shared<NotingOwner>(running_.loop);
    rings_ = board_->connect(owner_);
    running_.start();
  }
  void TearDown() override {
    running_.stop();
    rings_.reset();
  }

  Opened open(const ClientRing& ring) { return openWith(ring.descriptors()); }
  Opened openWith(std::vector<linux_host::UniqueDescriptor> descriptors) {
    return running_.onQueue([&] { return rings_->open(std::move(descriptors)); });
  }
  std::string declare(std::int64_t shape) { return declare(shape, {}); }
  // For messages to these sessions.
  std::string declare(std::int64_t shape, const std::vector<std::int64_t>& reporterIDs) {
    plist::Array ids;
    for (const std::int64_t id : reporterIDs) {
      ids.append(id);
    }
    plist::Dictionary description{{"shape", shape},
                                  {"category", 4},
                                  {"type", 1},
                                  {"keys", plist::Array{"number"}},
                                  {"kinds", plist::Array{"integer"}}};
    if (!reporterIDs.empty()) {
      description.set("reporterIDs", ids);
    }
    return running_.onQueue([&] { return rings_->declareShape(description).text(); });
  }
  bool eventuallyServed(std::size_t count) {
    return eventually([&] { return owner_->count == count; });
  }
  std::vector<std::int64_t> numbers() {
    return running_.onQueue([&] {
      std::vector<std::int64_t> all;
      for (const auto& request : owner_->requests) {
        all.push_back(request.dictionary["number"].asInt64());
      }
      return all;
    });
  }
  linux_host::RingCounts counts() {
    return running_.onQueue([&] { return board_->counts; });
  }
  std::uint64_t faults(linux_host::RingFault fault) { return counts().faults[static_cast<std::size_t>(fault)]; }
  std::uint64_t refused(tarnring_refusal refusal) { return counts().refused[static_cast<std::size_t>(refusal) - 1]; }
  // Ends the connection; whether its rings were drained.
  bool end() {
    auto drained = std::make_shared<std::atomic<bool>>(false);
    running_.onQueue([&] { rings_->end([drained] { *drained = true; }); });
    return eventually([&] { return drained->load(); }, std::chrono::seconds(5));
  }
  static std::uint64_t seen(const std::uint64_t& word) { return ring::SharedWords::loadAcquire(&word); }

  linux_host::RingLimits limits;
  std::atomic<std::uint64_t> handedOver{0};
  std::atomic<std::uint64_t> committed{0};
  std::atomic<bool> settled{true};
  RecordingLog log_;
  RunningLoop running_;
  std::unique_ptr<linux_host::RingBoard> board_;
  std::shared_ptr<NotingOwner> owner_;
  std::shared_ptr<linux_host::ConnectionRings> rings_;
};

}  // namespace tarn::testing
