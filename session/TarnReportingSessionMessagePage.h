// TarnReportingSessionMessagePage: some records in a row of a message list, as plain bytes in the platform's overflow
// store. A page never changes; who changes a record makes a new page.
//
// Threads: any.
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
  // Of all pages that share them.
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

  // Takes records one by one, then makes a page of them.
  class Maker {
   public:
    explicit Maker(std::size_t expectedBytes) { image_.reserve(expectedBytes); }
    Maker(const Maker&) = delete;
    Maker& operator=(const Maker&) = delete;

    void add(const TarnReportingSessionMessage& record);
    // The page, which lies in the store; nothing is kept after an error.
    Result<std::shared_ptr<const TarnReportingSessionMessagePage>> finish(platform::OverflowStore& store,
                                                                          const std::shared_ptr<Counts>& counts);
    // The page when that went wrong: it stays in memory.
    std::shared_ptr<const TarnReportingSessionMessagePage> finishInMemory(const std::shared_ptr<Counts>& counts);

   private:
    std::shared_ptr<TarnReportingSessionMessagePage> makePage(const std::shared_ptr<Counts>& counts);
    std::size_t numberOf(const TarnReportingSessionMessage::DestinationWorkers& destinations);
    void noteKind(TarnReportingSessionMessage::Kind kind);

    std::string image_;
    plist::PackedImageWriter writer_{image_};
    std::vector<TarnReportingSessionMessage::DestinationWorkers> destinations_;
    Contents contents_;
    double lastTime_ = 0;
    bool isSealed_ = false;
  };

  TarnReportingSessionMessagePage(const TarnReportingSessionMessagePage&) = delete;
  TarnReportingSessionMessagePage& operator=(const TarnReportingSessionMessagePage&) = delete;
  ~TarnReportingSessionMessagePage();

  // The records, made anew by each call. None when they can't be read back, which is counted and logged.
  std::vector<Record> read() const;

  const Contents& contents() const noexcept { return contents_; }
  std::size_t size() const noexcept { return contents_.records; }

 private:
  TarnReportingSessionMessagePage() = default;
  Result<std::vector<Record>> tryToRead() const;

  platform::OverflowStore* store_ = nullptr;  // null: the image is in memory
  platform::OverflowStore::Place place_ = 0;
  std::size_t storedBytes_ = 0;
  std::shared_ptr<Counts> counts_;
  std::string image_;
  std::vector<TarnReportingSessionMessage::DestinationWorkers> destinations_;
  Contents contents_;
};

}  // namespace tarn
