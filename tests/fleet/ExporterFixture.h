// SPDX-License-Identifier: Apache-2.0
// FleetExporter: an exporter between a store that a test fills and a server in memory, with time that the test moves.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <fstream>
#include <iterator>
#include <memory>
#include <set>
#include <string>

#include "fleet/export/Exporter.h"
#include "tests/ctl/SessionStoreFixture.h"
#include "tests/fleet/FakePublisher.h"

namespace tarn::fleet {

using namespace std::chrono_literals;
using testing::FakePublisher;

// What a collector would have made of what arrived.
struct Arrived {
  std::set<std::int64_t> events;
  std::int64_t repeated = 0;
  std::set<std::int64_t> leftOutRanges;  // firsts of batches, once each
  std::set<std::int64_t> gaps;           // ids
  std::set<std::int64_t> ended;          // sessions
};

inline Arrived arrivedAt(const FakePublisher& publisher) {
  Arrived all;
  for (const auto& [id, bytes] : publisher.messages()) {
    const auto batch = unpackMessage(bytes);
    EXPECT_TRUE(batch.ok()) << batch.error.text();
    if (batch.failed()) continue;
    for (const v1::Event& event : batch.value->events()) {
      all.repeated += all.events.insert(batch.value->first() + event.ahead()).second ? 0 : 1;
    }
    for (const v1::Gap& gap : batch.value->gaps()) {
      for (std::int64_t gone = gap.first(); gone <= gap.last(); ++gone) {
        all.gaps.insert(gone);
      }
    }
    for (const v1::Session& session : batch.value->sessions()) {
      if (session.has_ended()) {
        all.ended.insert(session.id());
      }
    }
  }
  return all;
}

class FleetExporter : public testing::SessionStoreFixture {
 protected:
  // One run of the program.
  struct Run {
    Run(const std::filesystem::path& directory, const std::filesystem::path& file, Publisher& publisher,
        std::uint64_t seed)
        : store(file),
          sieve(rules(), FleetKey::parse(std::string(64, '7')).value),
          cursor((directory / "cursor").string()),
          arrived((directory / "arrived").string()),
          window(publisher, Backoff(seed), {4, 1 << 20, 10s}),
          exporter(store, sieve, std::string(kDeviceBytes, 'd'), cursor, arrived, window, publisher) {
      const auto begun = exporter.begin();
      EXPECT_TRUE(begun.ok()) << begun.error.text();
      remark = begun.value;
    }
    static Rules rules() {
      Rules all;
      all.others = {"*"};
      all.keys = {"*"};
      return all;
    }

    StoreTail store;
    PrivacySieve sieve;
    CursorFile cursor;
    ArrivedFile arrived;
    SendWindow window;
    Exporter exporter;
    std::string remark;
  };

  void begin(std::uint64_t seed = 1) { run_ = std::make_unique<Run>(directory(), file(), publisher_, seed); }
  void step() {
    const Status status = run_->exporter.step({1795200000 + std::chrono::duration<double>(now_).count(), now_}, 0ms);
    EXPECT_TRUE(status.ok()) << status.text();
    now_ = std::max(now_ + 1ms, run_->window.due().value_or(now_));
  }
  void runToTheEnd() {
    for (int i = 0; i < 100000 && (i == 0 || !run_->exporter.isAtTheEnd()); ++i) {
      step();
    }
    EXPECT_TRUE(run_->exporter.isAtTheEnd());
  }
  void addEvents(std::int64_t count, std::int64_t session = 1) {
    sql("BEGIN");
    for (std::int64_t i = 0; i < count; ++i) {
      addEvent(session, 1795158000, "tally", "sys.oxbow.tarnkit.Volume.Summary", R"({"a":1})");
    }
    sql("COMMIT");
  }

  // What the recorder is told.
  std::string told() const {
    std::ifstream file(directory() / "arrived");
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }

  FakePublisher publisher_;
  std::unique_ptr<Run> run_;
  std::chrono::nanoseconds now_ = 1000s;
};

}  // namespace tarn::fleet
