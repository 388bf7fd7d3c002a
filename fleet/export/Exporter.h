// SPDX-License-Identifier: Apache-2.0
// Exporter: carries a store's records to a publisher: read, make a message, send, and remember how far it is once that
// is acknowledged. One step waits no longer than it is told, but for a connection to the publisher's server.
//
// What was acknowledged may be lost all the same, by a stream that loses what it had. So who has the records asks again
// for ids that nothing told of, and gets them from the store once more, or a word that they are gone; and when nothing
// new comes the exporter says how far it is, as what was lost last would not be missed otherwise.
//
// Threads: one. It owns nothing that it is handed.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "fleet/cursor/ArrivedFile.h"
#include "fleet/cursor/CursorFile.h"
#include "fleet/export/BatchMaker.h"
#include "fleet/format/Message.h"
#include "fleet/publish/SendWindow.h"
#include "fleet/store/StoreTail.h"
#include "recorder/store/retention/IdRange.h"

namespace tarn::fleet {

struct ExportClock {
  double epochSeconds = 0;
  std::chrono::nanoseconds monotonic{};
};

class Exporter {
 public:
  Exporter(StoreTail& store, PrivacySieve& sieve, const std::string& device, CursorFile& cursor, ArrivedFile& arrived,
           SendWindow& window, Publisher& publisher)
      : store_(store),
        sieve_(sieve),
        maker_(sieve, device),
        cursorFile_(cursor),
        arrivedFile_(arrived),
        window_(window),
        publisher_(publisher) {}

  // Takes up the cursor. What is to be told about it, if anything; the error is the disk's.
  Result<std::string> begin();
  // Reads, sends and takes what is known; waits for an outcome for so long when there is nothing else to do. The error
  // is of the store or of the cursor's disk; a later step tries again.
  [[nodiscard]] Status step(const ExportClock& now, std::chrono::milliseconds longest);

  // The same without reading anything more.
  [[nodiscard]] Status settle(const ExportClock& now, std::chrono::milliseconds longest);

  // Whether all that is in the store, as it was read last, has arrived, also what was asked for again.
  bool isAtTheEnd() const noexcept { return isAtTheEnd_ && window_.isEmpty() && asked_.empty(); }
  // The last id that arrived with all before it.
  std::int64_t arrived() const noexcept { return written_.event; }
  // Ids that were asked for again so far.
  std::int64_t askedAgain() const noexcept { return askedAgain_; }

 private:
  [[nodiscard]] Status fill(const ExportClock& now);
  [[nodiscard]] Status readPage(const ExportClock& now);
  // Whether the store is the one that the cursor is of; else it begins anew.
  [[nodiscard]] Status checkMark();
  [[nodiscard]] Status lookAtOpen(const ExportClock& now);
  [[nodiscard]] Status serveAsker(const ExportClock& now);
  [[nodiscard]] Status answer(const ExportClock& now);
  void takeAsked(const ExportClock& now);
  [[nodiscard]] Status tellPlace(const ExportClock& now);
  [[nodiscard]] Status add(MadeBatch made);
  void noteMark(const v1::Batch& batch);
  std::int64_t lookedAt(const ExportClock& now);

  StoreTail& store_;
  PrivacySieve& sieve_;
  BatchMaker maker_;
  CursorFile& cursorFile_;
  ArrivedFile& arrivedFile_;
  SendWindow& window_;
  Publisher& publisher_;
  MessagePacker packer_;
  Cursor next_;     // where it stands when all in the window has arrived
  Cursor written_;  // on the disk
  bool isAtTheEnd_ = false;
  bool isMarkChecked_ = false;
  std::chrono::nanoseconds nextLook_{};   // at open sessions
  std::chrono::nanoseconds nextWrite_{};  // of the cursor
  std::optional<Cursor> settled_;         // and not on the disk yet
  std::vector<recorder::IdRange> asked_;  // again, rising; all were read before
  std::chrono::nanoseconds nextAsked_{};
  std::int64_t askedAgain_ = 0;
  std::optional<std::chrono::nanoseconds> quietSince_;  // nothing new, and all has arrived
  std::int64_t toldPlace_ = 0;                          // how far it said that it is
};

}  // namespace tarn::fleet
