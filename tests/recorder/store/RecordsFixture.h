// SPDX-License-Identifier: Apache-2.0
// RecordsFixture: a recorder with the record of sessions beside it, and a thread that works for one of them at a time.
#pragma once

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "recorder/RecorderSessionRecords.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {

class RecordsFixture : public RecorderFixture {
 protected:
  using SessionNumber = platform::SessionNumber;
  using Rows = std::vector<std::string>;

  RecordsFixture() {
    options_.sessionOf = current;
    options_.boot = "boot";
    options_.version = "1.2.3";
    options_.machine = R"({"os":"Testix"})";
    clock_.setEpochSeconds(kNow);
  }
  ~RecordsFixture() override { worksFor_ = 0; }

  void begin() {
    records_.emplace(start(), clock_, enterSession);
    recorder_->waitUntilOpened();
  }
  void end() {
    stop();
    records_.reset();
  }
  SessionNumber create(std::int64_t reporter = 10) {
    platform::SessionFacts facts;
    facts.reporter = reporter;
    return records_->created(facts);
  }
  void recordFor(SessionNumber session, const std::string& name, const Dictionary& payload = {}) {
    records_->enter(session);
    record(name, payload);
    records_->enter(0);
  }
  static void workFor(SessionNumber session) { worksFor_ = session; }
  void waitSeconds(double seconds) { clock_.setEpochSeconds(clock_.epochSeconds() + seconds); }
  Rows sessions(const std::string& columns) { return ask(file(), "SELECT " + columns + " FROM sessions ORDER BY id"); }
  Rows periods(const std::string& columns) { return ask(file(), "SELECT " + columns + " FROM periods ORDER BY id"); }

  static constexpr double kNow = 1750000000;
  std::optional<RecorderSessionRecords> records_;

 private:
  static SessionNumber current() noexcept { return worksFor_; }
  static SessionNumber enterSession(SessionNumber session) noexcept { return std::exchange(worksFor_, session); }

  static inline thread_local SessionNumber worksFor_ = 0;
};

}  // namespace tarn::recorder
