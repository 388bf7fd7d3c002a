// SPDX-License-Identifier: Apache-2.0
// BatchMaker: makes batches of a store's events: what the rules let through, and a word for every id that they don't.
//
//   ids   11 12 13 14 .. 40 41        events 11, 13, 41
//          |  |  |   gap   |          left out 12
//   batch first = 11, last = 41       gap 14-40
//
// Threads: one. It owns nothing that it is handed.
#pragma once

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

#include "fleet/format/Message.h"
#include "fleet/privacy/PrivacySieve.h"
#include "fleet/store/StoredSessions.h"
#include "recorder/store/reading/EventReader.h"

namespace tarn::fleet {

// Bounds of one batch; both far below what a message may have.
struct BatchLimits {
  std::size_t bytes = 256 * 1024;        // of its texts, before they are packed; one record more may be in it
  std::size_t recordBytes = 384 * 1024;  // of one record's payload; a larger one is left out
};

struct MadeBatch {
  v1::Batch batch;
  // Of its sessions those that haven't ended as far as the store knows, or of whose periods not all are told: they have
  // to be looked at again.
  std::vector<std::int64_t> open;
};

class BatchMaker {
 public:
  // The device's name: 16 bytes.
  BatchMaker(PrivacySieve& sieve, std::string device, BatchLimits limits = {})
      : sieve_(sieve), device_(std::move(device)), limits_(limits) {}

  // A batch of the ids after `after`, with as many of the rows, which rise and begin after it, as it may hold; the last
  // one's id is the batch's last. `lookedAt`: microseconds. The error is that of `sessions`.
  Result<MadeBatch> make(const std::vector<recorder::EventRow>& rows, std::int64_t after, std::int64_t lookedAt,
                         StoredSessions& sessions);
  // The same of ids that were told of before, up to `last` at the most: what has no row among them is gone. `rows` are
  // all that there are up to `last`, or the first of them where `isWhole` is false. Of their sessions all is told.
  Result<MadeBatch> makeAgain(const std::vector<recorder::EventRow>& rows, recorder::IdRange ids, bool isWhole,
                              std::int64_t lookedAt, StoredSessions& sessions);
  // One of sessions alone; those that aren't there any more are passed over. Of none it says how far the device is.
  Result<MadeBatch> makeOfSessions(const std::vector<std::int64_t>& ids, std::int64_t after, std::int64_t lookedAt,
                                   StoredSessions& sessions);

 private:
  // A session in the batch: 1 + its index; 0 for nobody's. `isKept`: its events may leave.
  struct Place {
    std::uint32_t number = 0;
    bool isKept = true;
  };

  void begin(std::int64_t after, std::int64_t lookedAt);
  void addGap(std::int64_t first, std::int64_t last);
  [[nodiscard]] Status addEvent(const recorder::EventRow& row, StoredSessions& sessions);
  void addRecord(const recorder::EventRow& row, std::uint32_t session);
  std::uint32_t kindOf(const recorder::EventRow& row);
  Result<Place> placeOf(std::int64_t session, StoredSessions& sessions);
  std::uint32_t addSession(const StoredSession& stored);
  void addPeriods(const std::vector<recorder::PeriodRow>& periods, v1::Session& session);
  std::uint32_t addRun(const recorder::RunRow& row);

  PrivacySieve& sieve_;
  const std::string device_;
  const BatchLimits limits_;
  // Of the batch that is being made.
  MadeBatch made_;
  std::size_t bytes_ = 0;
  std::unordered_map<std::int64_t, Place> sessions_;
  std::unordered_map<std::int64_t, std::uint32_t> runs_;
  std::unordered_map<std::string, std::uint32_t> kinds_;
  std::string key_, payload_;
  // By session, up to which id its periods were told of in earlier batches and are over.
  std::unordered_map<std::int64_t, std::int64_t> told_;
};

}  // namespace tarn::fleet
