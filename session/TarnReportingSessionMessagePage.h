// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionMessagePage: some records in a row of a message list, as plain bytes in the platform's overflow
// store. A page never changes; who changes a record makes a new page.
//
// Threads: any.
//
// A page is self-contained but for the names of destination workers, which are static texts of the program and stay in
// memory: a page has no meaning for another process. A checksum at its end sees what a disk did to it.
#pragma once

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/OverflowStore.h"
#include "plist/PackedImage.h"
#include "plist/Result.h"
#include "session/TarnReportingSessionMessage.h"

namespace tarn {

class TarnReportingSessionMessagePage {
 public:
  using Record = std::shared_ptr<TarnReportingSessionMessage>;
  // Of all pages that share them. Atomic, since the last owner of a page may let go of it on another thread, as
  // summaries do that are made off the server queue.
  struct Counts {
    std::atomic<std::size_t> bytesInStore = 0;
    std::atomic<std::size_t> bytesInMemory = 0;  // of those that the store had no room for
    std::atomic<std::uint64_t> recordsLost = 0;  // that couldn't be read back
  };

  // What is known of the records while the page lies in the store.
  struct Contents {
    std::size_t records = 0;
    // By TarnReportingSessionMessage::sortingTime.
    double earliest = 0;
    double latest = 0;
    // Whether each record's time is at least that of the one before it.
    bool isSorted = true;
    // The kinds of the records, each once and in no order; of many kinds none is kept.
    std::vector<TarnReportingSessionMessage::Kind> kinds;
    bool hasManyKinds = false;

    // Whether wants(kind) may be true for a record's.
    template <class Wants>
    bool mayHave(const Wants& wants) const {
      return hasManyKinds || std::any_of(kinds.rbegin(), kinds.rend(), wants);
    }
  };

  // Takes records one by one, then makes a page of them. For one page. Threads: the server queue.
  class Maker {
   public:
    // A guess saves copies of the image as it grows; 0 is no guess.
    explicit Maker(std::size_t expectedBytes) { image_.reserve(expectedBytes); }
    Maker(const Maker&) = delete;
    Maker& operator=(const Maker&) = delete;

    // Payload, category, type, flags and destinations go into the page; the record's guard and identity don't.
    void add(const TarnReportingSessionMessage& record);
    // The page, which lies in the store; nothing is kept after an error. Once. The error is the store's. The image is
    // still here then, for finishInMemory().
    Result<std::shared_ptr<const TarnReportingSessionMessagePage>> finish(platform::OverflowStore& store,
                                                                          const std::shared_ptr<Counts>& counts);
    // The page when that went wrong: it stays in memory.
    std::shared_ptr<const TarnReportingSessionMessagePage> finishInMemory(const std::shared_ptr<Counts>& counts);

   private:
    // A page without records.
    static std::shared_ptr<TarnReportingSessionMessagePage> makePage(const std::shared_ptr<Counts>& counts);
    // Gives it what was added so far; the maker is spent.
    void fill(TarnReportingSessionMessagePage& page) noexcept;
    // The place of these destinations in the page's table plus one; 0 for everyone.
    std::size_t numberOf(const TarnReportingSessionMessage::DestinationWorkers& destinations);
    void noteKind(TarnReportingSessionMessage::Kind kind);

    std::string image_;
    plist::PackedImageWriter writer_{image_};
    std::vector<TarnReportingSessionMessage::DestinationWorkers> destinations_;
    Contents contents_;
    double lastTime_ = 0;
  };

  TarnReportingSessionMessagePage(const TarnReportingSessionMessagePage&) = delete;
  TarnReportingSessionMessagePage& operator=(const TarnReportingSessionMessagePage&) = delete;
  // Gives back what it takes in the store.
  ~TarnReportingSessionMessagePage();

  // The records, made anew by each call. None when they can't be read back, which is counted and logged. A read that
  // fails is tried once more, since a fault may have been the moment's. The loss has one error line, with the number of
  // messages and the reason.
  std::vector<Record> read() const;

  const Contents& contents() const noexcept { return contents_; }
  // In records.
  std::size_t size() const noexcept { return contents_.records; }

 private:
  TarnReportingSessionMessagePage() = default;
  // Fails with the store's error, or with a text of its own when the page is cut or damaged.
  Result<std::vector<Record>> tryToRead() const;

  platform::OverflowStore* store_ = nullptr;  // null: the image is in memory
  platform::OverflowStore::Place place_{};
  // What it takes in the store, told back to the counts at its end.
  std::size_t storedBytes_{};
  std::shared_ptr<Counts> counts_;
  // The records one after the other, then the checksum; empty when the store has it.
  std::string image_;
  std::vector<TarnReportingSessionMessage::DestinationWorkers> destinations_;
  Contents contents_;
};

}  // namespace tarn
