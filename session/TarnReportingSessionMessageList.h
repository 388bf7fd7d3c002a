// TarnReportingSessionMessageList: a list of records that may be longer than the memory has room for.
//
//   [page][page][page] ... [record][record][record]
//    the oldest, in the     the newest, as they were appended
//    overflow store
//
// A list that never outgrew its bound is the second part alone. What the first part holds is read page by page, two at
// a time, so that a walk takes the same memory however long the list is. Records of a page are made anew whenever it is
// read: who changes one in place does it by change(), which has the page written anew.
//
// A loop over a list keeps what it goes through in its place, so it may append to this and other lists meanwhile. A
// page that can't be read back is left out of the loops.
//
// Owner: a session's log, or a walk over one. Threads: the server queue.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "session/TarnReportingSessionLogMemory.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

class TarnReportingSessionMessageList {
 public:
  using Record = std::shared_ptr<TarnReportingSessionMessage>;
  using Page = TarnReportingSessionMessagePage;
  class Iterator;

  TarnReportingSessionMessageList() = default;
  // The log of a session.
  explicit TarnReportingSessionMessageList(std::int64_t reporterID) : reporterID_(reporterID) {}
  TarnReportingSessionMessageList(TarnReportingSessionMessageList&& other) noexcept;
  TarnReportingSessionMessageList& operator=(TarnReportingSessionMessageList&& other) noexcept;
  TarnReportingSessionMessageList(const TarnReportingSessionMessageList&) = delete;
  TarnReportingSessionMessageList& operator=(const TarnReportingSessionMessageList&) = delete;
  ~TarnReportingSessionMessageList();

  // Where the list's memory is counted too from now on; null: nowhere.
  void setAccount(std::shared_ptr<TarnReportingSessionLogAccount> account);

  void append(Record record);
  // Sorts by time stamp (TarnReportingSessionMessage::sortMessages); false when nothing had to be moved for sure. What
  // couldn't be read back is gone then.
  bool sort();
  void clear();

  std::size_t size() const noexcept { return overflowed_ + (recent_ ? recent_->size() : 0); }
  bool empty() const noexcept { return size() == 0; }
  // The record; null for one that can't be read back.
  Record operator[](std::size_t index) const;
  Record at(std::size_t index) const { return (*this)[index]; }
  Record front() const { return (*this)[0]; }
  Record back() const { return (*this)[size() - 1]; }
  Iterator begin() const;
  std::default_sentinel_t end() const noexcept { return {}; }

  // Lets `apply(record)` change a record in place.
  template <class Apply>
  void change(std::size_t index, Apply apply) const {
    const Record record = (*this)[index];
    if (!record) return;
    apply(*record);
    if (index < overflowed_) {
      noteChange(index);
    }
  }
  // Calls take(index, record) from the last record to the first until it returns false. Pages of which wants(kind) is
  // true for none of the kinds are passed over.
  template <class Wants, class Take>
  void goBack(const Wants& wants, Take take) const;
  // How often records of pages were changed in place.
  std::uint64_t changes() const noexcept { return changes_; }

  // The first so many records lie in pages.
  std::size_t overflowed() const noexcept { return overflowed_; }
  // The pages as they are now, without those that couldn't be read back.
  std::vector<std::shared_ptr<const Page>> pages() const;
  // The records behind them.
  const TarnReportingSessionMessages& recent() const;

 private:
  friend class TarnReportingSessionLogMemory;

  // A page and the place of its first record. A lost one couldn't be read back.
  struct Part {
    std::shared_ptr<const Page> page;
    std::size_t first;
    bool isLost = false;
  };
  // The records of a part that was read.
  struct Opened {
    std::size_t part = kNone;
    std::size_t first = 0;
    std::vector<Record> records;
    bool isChanged = false;
  };
  // Records in a row that are moved to the store at once.
  struct Chunk {
    std::size_t records = 0;
    std::size_t bytes = 0;
  };
  struct Run;
  static constexpr std::size_t kNone = static_cast<std::size_t>(-1);

  // The record; the reference holds until the second other page is read. Null for one that can't be read back.
  const Record& look(std::size_t index) const;
  std::size_t partOf(std::size_t index) const noexcept;
  const Opened& open(std::size_t part) const;
  void closePart(Opened& opened) const;
  void noteChange(std::size_t index) const;

  // Moves the oldest records in memory to the store; false when that is not possible now.
  bool moveOldest();
  // Whether all are there then.
  bool moveAll();
  void addPart(std::shared_ptr<const Page> page);
  void tellOverflow();
  bool isSorted() const;
  void sortPages();
  std::vector<Run> sortedRuns(std::vector<std::shared_ptr<const Page>> pages) const;
  void merge(std::vector<Run>& runs);
  void takeFrom(TarnReportingSessionMessageList& other) noexcept;

  std::optional<std::int64_t> reporterID_;  // of a session's log
  std::shared_ptr<TarnReportingSessionLogAccount> account_;
  std::shared_ptr<TarnReportingSessionLogMemory> memory_;  // from the first record on
  TarnReportingSessionLogMemory::Link link_;
  mutable int pins_ = 0;  // loops that go on; nothing is moved meanwhile
  bool isTold_ = false;

  // Made with the first: most sessions of a client that has thousands never get a message.
  std::unique_ptr<TarnReportingSessionMessages> recent_;
  std::size_t bytes_ = 0;
  std::vector<Chunk> chunks_;  // of recent_, those that are complete
  std::size_t firstChunk_ = 0;
  Chunk openChunk_;

  std::size_t overflowed_ = 0;
  mutable std::vector<Part> parts_;
  mutable std::array<Opened, 2> opened_;  // the one read last comes first
  mutable std::uint64_t changes_ = 0;
};

// Goes through the records that can be read. What it shows holds until it goes on to the page after the next.
class TarnReportingSessionMessageList::Iterator {
 public:
  using value_type = Record;
  using reference = const Record&;
  using difference_type = std::ptrdiff_t;
  using iterator_concept = std::input_iterator_tag;

  Iterator(Iterator&& other) noexcept : list_(std::exchange(other.list_, nullptr)), index_(other.index_) {}
  Iterator& operator=(Iterator&& other) noexcept {
    std::swap(list_, other.list_);
    std::swap(index_, other.index_);
    return *this;
  }
  Iterator(const Iterator&) = delete;
  Iterator& operator=(const Iterator&) = delete;
  ~Iterator() {
    if (list_ != nullptr) {
      --list_->pins_;
    }
  }

  reference operator*() const { return list_->look(index_); }
  const Record* operator->() const { return &list_->look(index_); }
  Iterator& operator++() {
    ++index_;
    skipLost();
    return *this;
  }
  void operator++(int) { ++*this; }
  friend bool operator==(const Iterator& at, std::default_sentinel_t) { return at.index_ >= at.list_->size(); }

  std::size_t index() const noexcept { return index_; }
  // Whether the record is the first of its page, or the first behind the pages: what was shown of the page before goes.
  bool beginsPage() const noexcept {
    if (index_ > list_->overflowed_ || list_->overflowed_ == 0) return false;
    return index_ == list_->overflowed_ || list_->parts_[list_->partOf(index_)].first == index_;
  }

 private:
  friend class TarnReportingSessionMessageList;
  explicit Iterator(const TarnReportingSessionMessageList& list) : list_(&list) {
    ++list_->pins_;
    skipLost();
  }
  void skipLost() {
    while (index_ < list_->overflowed_ && !list_->look(index_)) {
      const std::size_t part = list_->partOf(index_);
      index_ = list_->parts_[part].first + list_->parts_[part].page->size();
    }
  }

  const TarnReportingSessionMessageList* list_;
  std::size_t index_ = 0;
};

template <class Wants, class Take>
void TarnReportingSessionMessageList::goBack(const Wants& wants, Take take) const {
  for (std::size_t index = size(); index > overflowed_; --index) {
    if (!take(index - 1, (*recent_)[index - 1 - overflowed_])) return;
  }
  for (std::size_t part = parts_.size(); part > 0; --part) {
    if (!parts_[part - 1].page->contents().mayHave(wants)) continue;
    const Opened& opened = open(part - 1);
    for (std::size_t index = opened.records.size(); index > 0; --index) {
      if (!take(opened.first + index - 1, opened.records[index - 1])) return;
    }
  }
}

inline TarnReportingSessionMessageList::Iterator TarnReportingSessionMessageList::begin() const {
  return Iterator(*this);
}

inline const TarnReportingSessionMessageList::Record& TarnReportingSessionMessageList::look(std::size_t index) const {
  if (index >= overflowed_) [[likely]] {
    return (*recent_)[index - overflowed_];
  }
  static const Record kLost;
  const Opened& opened = open(partOf(index));
  return index - opened.first < opened.records.size() ? opened.records[index - opened.first] : kLost;
}

}  // namespace tarn
