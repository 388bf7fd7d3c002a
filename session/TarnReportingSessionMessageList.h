// SPDX-License-Identifier: Apache-2.0
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
#include <functional>
#include <iterator>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "session/TarnReportingSessionLogMemory.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionMessagePage.h"

namespace tarn {

// Movable, so that a sort can hold runs. A list that is moved from is empty.
class TarnReportingSessionMessageList {
 public:
  using Record = std::shared_ptr<TarnReportingSessionMessage>;
  using Page = TarnReportingSessionMessagePage;
  class Iterator;

  // A list of a walk's own, which tells nobody when it overflows.
  TarnReportingSessionMessageList() = default;
  // The log of a session. Its first overflow since it was empty logs a line with this ID, the messages and the bytes.
  explicit TarnReportingSessionMessageList(std::int64_t reporterID) : reporterID_(reporterID) {}
  // No loop goes on over either.
  TarnReportingSessionMessageList(TarnReportingSessionMessageList&& other) noexcept;
  TarnReportingSessionMessageList& operator=(TarnReportingSessionMessageList&& other) noexcept;
  TarnReportingSessionMessageList(const TarnReportingSessionMessageList&) = delete;
  TarnReportingSessionMessageList& operator=(const TarnReportingSessionMessageList&) = delete;
  ~TarnReportingSessionMessageList();

  // Where the list's memory is counted too from now on; null: nowhere. What the list holds now moves from the old
  // account to the new one.
  void setAccount(std::shared_ptr<TarnReportingSessionLogAccount> account);

  // Then moves the oldest messages of this list or of the largest one to the store, when a bound is exceeded. A store
  // that fails loses nothing: the record is in the list in any case. Without the memory for it nothing has changed.
  void append(Record record);
  // Sorts by time stamp (TarnReportingSessionMessage::sortMessages) and stably; false when nothing had to be moved for
  // sure. What couldn't be read back is gone then. A list in order costs one pass, of pages over their times alone.
  // Else runs of pages are merged; see the source. When memory is missing for it, a list without pages is as it was,
  // and one with pages keeps what was merged by then.
  bool sort();
  // Gives back the memory and what it takes in the store, and needs none. No loop goes on over the list.
  void clear();

  // Records of pages that can't be read back count until a sort or clear().
  std::size_t size() const noexcept { return overflowed_ + (recent_ ? recent_->size() : 0); }
  bool empty() const noexcept { return size() == 0; }
  // The record; null for one that can't be read back. Below overflowed() it may read a page: in order that costs a read
  // a page, at random one a record.
  Record operator[](std::size_t index) const;
  Record at(std::size_t index) const { return (*this)[index]; }
  // For who needs this one alone: its page isn't kept open, which a thousand sessions at a time have no memory for.
  Record readAlone(std::size_t index) const;
  // Of a list that isn't empty.
  Record front() const { return (*this)[0]; }
  Record back() const { return (*this)[size() - 1]; }
  // Only one pass: an iterator is moved, not copied, and nothing of the list is moved to the store while it lives.
  Iterator begin() const;
  std::default_sentinel_t end() const noexcept { return {}; }

  // Goes through all records that can be read: take(index, record). beginPage() comes before the first record of each
  // page and of those in memory behind pages: what was shown of the page before goes. What is in memory takes a plain
  // loop, so nothing may be appended to this list meanwhile.
  template <class Take, class BeginPage>
  void forEach(Take take, BeginPage beginPage) const;

  // Lets `apply(record)` change a record in place. Nothing happens when the record can't be read back. The page is
  // written anew when it is left; when there is no room for it, it stays in memory.
  template <class Apply>
  void change(std::size_t index, Apply apply) const {
    const Record record = (*this)[index];
    if (!record) return;
    apply(*record);
    if (index < overflowed_) {
      noteChange(index);
    }
  }
  // Calls take(index, record) from the record before `end` to the first, for as long as it returns true. Pages of which
  // wants(kind) is true for none of the kinds are passed over. Nothing may be appended to this list meanwhile.
  void goBack(std::size_t end, const std::function<bool(TarnReportingSessionMessage::Kind)>& wants,
              const std::function<bool(std::size_t, const Record&)>& take) const;
  // How often records of pages were changed in place: by it, whoever keeps one that was read back knows a stale one.
  std::uint64_t changes() const noexcept { return changes_; }

  // The first so many records lie in pages.
  std::size_t overflowed() const noexcept { return overflowed_; }
  // The pages as they are now, without those that couldn't be read back; changed ones are written first. Threads: any.
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
  // The part of a record below overflowed().
  std::size_t partOf(std::size_t index) const noexcept;
  // Those of an open page, or read for the caller alone; none of a lost one.
  std::vector<Record> recordsOf(std::size_t part) const;
  // Reads the part's page unless it is one of the two that are open; an empty one when that is lost.
  const Opened& open(std::size_t part) const;
  // Writes a changed page anew.
  void closePart(Opened& opened) const;
  // Marks the open page of this record as changed.
  void noteChange(std::size_t index) const;

  // Moves the oldest records in memory to the store; false when that is not possible now.
  bool moveOldest();
  // Moves as much as the store takes; whether all records are there then.
  bool moveAll();
  // Puts a page behind the others. Nothing is in memory then.
  void addPart(std::shared_ptr<const Page> page);
  // The line of the first overflow.
  void tellOverflow();
  // By the pages' times and the records in memory; reads nothing.
  bool isSorted() const;
  // Sorts what lies in pages and in memory; two pages of each run are in memory at a time.
  void sortPages();
  std::vector<Run> sortedRuns(std::vector<std::shared_ptr<const Page>> pages) const;
  void merge(std::vector<Run>& runs);
  void takeFrom(TarnReportingSessionMessageList& other) noexcept;

  // Nothing for lists of walks and sorts.
  std::optional<std::int64_t> reporterID_;  // of a session's log
  std::shared_ptr<TarnReportingSessionLogAccount> account_;
  std::shared_ptr<TarnReportingSessionLogMemory> memory_;  // from the first record on
  TarnReportingSessionLogMemory::Link link_;
  mutable int pins_ = 0;  // loops that go on; nothing is moved meanwhile
  bool isTold_ = false;

  // Made with the first: most sessions of a client that has thousands never get a message.
  std::unique_ptr<TarnReportingSessionMessages> recent_;
  std::size_t bytes_ = 0;
  // What is moved together next; `firstChunk_` is the oldest of them that is still in memory.
  std::vector<Chunk> chunks_;  // of recent_, those that are complete
  std::size_t firstChunk_ = 0;
  Chunk openChunk_;

  // The parts' records, the parts, and the two that are open: a walk that compares neighbours needs two.
  std::size_t overflowed_ = 0;
  mutable std::vector<Part> parts_;
  mutable std::array<Opened, 2> opened_;  // the one read last comes first
  mutable std::uint64_t changes_ = 0;
};

// Goes through the records that can be read. What it shows holds until it goes on to the page after the next.
class TarnReportingSessionMessageList::Iterator {
 public:
  Iterator(const Iterator&) = delete;
  Iterator& operator=(const Iterator&) = delete;
  ~Iterator() { --list_.pins_; }

  // Records that can't be read back are skipped on the way, so this one is there.
  const Record& operator*() const { return list_.look(index_); }
  const Record* operator->() const { return &list_.look(index_); }
  Iterator& operator++() {
    if (++index_ < list_.overflowed_) {
      skipLost();
    }
    return *this;
  }
  friend bool operator==(const Iterator& at, std::default_sentinel_t) { return at.index_ >= at.list_.size(); }

  // The record's place in the list.
  std::size_t index() const noexcept { return index_; }

 private:
  friend class TarnReportingSessionMessageList;
  explicit Iterator(const TarnReportingSessionMessageList& list) : list_(list) {
    skipLost();  // may throw, and then nobody would take the pin back
    ++list_.pins_;
  }
  // Goes past the pages that can't be read back.
  void skipLost();

  const TarnReportingSessionMessageList& list_;
  std::size_t index_ = 0;
};

template <class Take, class BeginPage>
void TarnReportingSessionMessageList::forEach(Take take, BeginPage beginPage) const {
  Iterator at(*this);  // keeps all in its place to the end
  for (; at.index() < overflowed_; ++at) {
    if (parts_[partOf(at.index())].first == at.index()) {
      beginPage();
    }
    take(at.index(), *at);
  }
  std::size_t index = overflowed_;
  if (index > 0) {
    beginPage();
  }
  for (const Record& record : recent()) {
    take(index++, record);
  }
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
