// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionMessageList.h"

#include <algorithm>

#include "platform/WorkQueue.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingUtility.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionMessageList"};

// Of writing or reading a page, in units of about a microsecond; its records come to that.
constexpr std::size_t kPageCost = 8;
constexpr std::size_t kRecordsPerCost = 4;

// A page takes as long as many messages: whoever sends the one that needs it pays, and others get their turn sooner.
void charge(std::size_t records) {
  TarnReportingUtilityGetReportingServerQueue()->spend(kPageCost + records / kRecordsPerCost);
}

}  // namespace

TarnReportingSessionMessageList::TarnReportingSessionMessageList(TarnReportingSessionMessageList&& other) noexcept {
  takeFrom(other);
}

TarnReportingSessionMessageList& TarnReportingSessionMessageList::operator=(
    TarnReportingSessionMessageList&& other) noexcept {
  if (this != &other) {
    clear();
    takeFrom(other);
  }
  return *this;
}

TarnReportingSessionMessageList::~TarnReportingSessionMessageList() {
  clear();
}

// This list is empty.
void TarnReportingSessionMessageList::takeFrom(TarnReportingSessionMessageList& other) noexcept {
  reporterID_ = other.reporterID_;
  account_ = other.account_;
  memory_ = other.memory_;
  isTold_ = std::exchange(other.isTold_, false);
  recent_.swap(other.recent_);
  bytes_ = std::exchange(other.bytes_, 0);
  chunks_.swap(other.chunks_);
  firstChunk_ = std::exchange(other.firstChunk_, 0);
  openChunk_ = std::exchange(other.openChunk_, {});
  overflowed_ = std::exchange(other.overflowed_, 0);
  parts_.swap(other.parts_);
  opened_.swap(other.opened_);
  if (memory_) {
    memory_->place(*this);
  }
}

void TarnReportingSessionMessageList::setAccount(std::shared_ptr<TarnReportingSessionLogAccount> account) {
  if (memory_) {
    memory_->leave(*this);
  }
  if (account_) {
    account_->bytes -= bytes_;
  }
  account_ = std::move(account);
  if (account_) {
    account_->bytes += bytes_;
  }
  if (memory_) {
    memory_->enter(*this);
  }
}

void TarnReportingSessionMessageList::append(Record record) {
  if (!memory_) [[unlikely]] {
    memory_ = ProcessState::of<TarnReportingSessionLogMemory>();
  }
  const std::size_t cost = memory_->costOf(*record);
  if (!recent_) [[unlikely]] {
    recent_ = std::make_unique<TarnReportingSessionMessages>();
  }
  // Whatever needs memory first: the record is in the list, and counted, or it isn't.
  if (chunks_.size() == chunks_.capacity()) {
    chunks_.reserve(2 * chunks_.size() + 1);
  }
  recent_->push_back(std::move(record));
  memory_->add(*this, cost);
  ++openChunk_.records;
  openChunk_.bytes += cost;
  if (openChunk_.bytes >= memory_->chunkBytes()) {
    chunks_.push_back(openChunk_);
    openChunk_ = {};
  }
  memory_->relieve(*this);
}

const TarnReportingSessionMessages& TarnReportingSessionMessageList::recent() const {
  static const TarnReportingSessionMessages kEmpty;
  return recent_ ? *recent_ : kEmpty;
}

void TarnReportingSessionMessageList::clear() {
  recent_.reset();
  chunks_ = {};
  firstChunk_ = 0;
  openChunk_ = {};
  if (!parts_.empty()) {
    --memory_->overflowing_;
    opened_ = {};
    parts_ = {};
    overflowed_ = 0;
  }
  if (memory_) {
    memory_->subtract(*this, bytes_);
  }
  isTold_ = false;
}

TarnReportingSessionMessageList::Record TarnReportingSessionMessageList::operator[](std::size_t index) const {
  return look(index);
}

TarnReportingSessionMessageList::Record TarnReportingSessionMessageList::readAlone(std::size_t index) const {
  if (index >= overflowed_) return look(index);
  const std::size_t part = partOf(index);
  const std::vector<Record> records = recordsOf(part);
  return records.empty() ? nullptr : records[index - parts_[part].first];
}

TarnReportingSessionMessageList::Iterator TarnReportingSessionMessageList::begin() const {
  return Iterator(*this);
}

void TarnReportingSessionMessageList::Iterator::skipLost() {
  while (index_ < list_.overflowed_) {
    const std::size_t part = list_.partOf(index_);
    if (!list_.open(part).records.empty()) break;
    index_ = list_.parts_[part].first + list_.parts_[part].page->size();
  }
}

void TarnReportingSessionMessageList::goBack(std::size_t end,
                                             const std::function<bool(TarnReportingSessionMessage::Kind)>& wants,
                                             const std::function<bool(std::size_t, const Record&)>& take) const {
  if (end > overflowed_) {
    const auto first = recent().begin();
    for (auto record = first + static_cast<std::ptrdiff_t>(end - overflowed_); record != first;) {
      if (!take(--end, *--record)) return;
    }
  }
  for (std::size_t part = end > 0 ? partOf(end - 1) + 1 : 0; part > 0; --part) {
    if (!parts_[part - 1].page->contents().mayHave(wants)) continue;
    const std::vector<Record> records = recordsOf(part - 1);
    const std::size_t first = parts_[part - 1].first;
    for (std::size_t left = std::min(records.size(), end - first); left > 0; --left) {
      if (!take(first + left - 1, records[left - 1])) return;
    }
  }
}

std::vector<std::shared_ptr<const TarnReportingSessionMessagePage>> TarnReportingSessionMessageList::pages() const {
  for (Opened& opened : opened_) {
    closePart(opened);
  }
  std::vector<std::shared_ptr<const Page>> pages;
  for (const Part& part : parts_) {
    if (!part.isLost) {
      pages.push_back(part.page);
    }
  }
  return pages;
}

std::size_t TarnReportingSessionMessageList::partOf(std::size_t index) const noexcept {
  const auto behind = std::upper_bound(parts_.begin(), parts_.end(), index,
                                       [](std::size_t place, const Part& part) { return place < part.first; });
  return static_cast<std::size_t>(behind - parts_.begin()) - 1;
}

const TarnReportingSessionMessageList::Opened& TarnReportingSessionMessageList::open(std::size_t part) const {
  static const Opened kLost;
  if (opened_[0].part == part) return opened_[0];
  if (opened_[1].part == part) {
    std::swap(opened_[0], opened_[1]);
    return opened_[0];
  }
  Part& read = parts_[part];
  if (read.isLost) return kLost;
  std::vector<Record> records = read.page->read();
  if (records.empty()) {
    read.isLost = true;
    return kLost;
  }
  closePart(opened_[1]);
  opened_[1] = {part, read.first, std::move(records)};
  std::swap(opened_[0], opened_[1]);
  return opened_[0];
}

std::vector<TarnReportingSessionMessageList::Record> TarnReportingSessionMessageList::recordsOf(
    std::size_t part) const {
  for (const Opened& opened : opened_) {
    if (opened.part == part) return opened.records;
  }
  Part& read = parts_[part];
  if (read.isLost) return {};
  charge(read.page->size());
  std::vector<Record> records = read.page->read();
  read.isLost = records.empty();
  return records;
}

// Has the page of records that were changed written anew. When there is no room for it, it stays in memory.
void TarnReportingSessionMessageList::closePart(Opened& opened) const {
  if (!opened.isChanged) return;
  Part& part = parts_[opened.part];
  Page::Maker maker(0);
  for (const Record& record : opened.records) {
    maker.add(*record);
  }
  auto written = maker.finish(*memory_->store_, memory_->pageCounts_);
  if (written.failed()) {
    memory_->toldFailure(*written.error);
    written.value = maker.finishInMemory(memory_->pageCounts_);
  }
  part.page = std::move(written.value);
  opened.isChanged = false;
}

void TarnReportingSessionMessageList::noteChange(std::size_t index) const {
  ++changes_;
  for (Opened& opened : opened_) {
    if (index - opened.first < opened.records.size()) {
      opened.isChanged = true;
    }
  }
}

bool TarnReportingSessionMessageList::moveOldest() {
  if (pins_ > 0 || !recent_ || recent_->empty()) return false;
  const Chunk chunk = firstChunk_ < chunks_.size() ? chunks_[firstChunk_] : openChunk_;
  const auto end = recent_->begin() + static_cast<std::ptrdiff_t>(chunk.records);
  charge(chunk.records);
  Page::Maker maker(chunk.bytes);
  std::for_each(recent_->begin(), end, [&](const Record& record) { maker.add(*record); });
  auto page = maker.finish(*memory_->store_, memory_->pageCounts_);
  if (page.failed()) {
    memory_->toldFailure(*page.error);
    return false;
  }
  memory_->toldSuccess();
  addPart(std::move(page.value));
  recent_->erase(recent_->begin(), end);
  if (firstChunk_ == chunks_.size()) {
    openChunk_ = {};
  } else if (++firstChunk_ == chunks_.size()) {
    chunks_.clear();
    firstChunk_ = 0;
  }
  memory_->subtract(*this, chunk.bytes);
  return true;
}

bool TarnReportingSessionMessageList::moveAll() {
  while (memory_->mayTry() && moveOldest()) {
  }
  return size() == overflowed_;
}

void TarnReportingSessionMessageList::addPart(std::shared_ptr<const Page> page) {
  parts_.push_back({std::move(page), overflowed_});
  if (parts_.size() == 1) {
    ++memory_->overflowing_;
    tellOverflow();
  }
  overflowed_ += parts_.back().page->size();
}

void TarnReportingSessionMessageList::tellOverflow() {
  if (!reporterID_ || std::exchange(isTold_, true)) return;
  kLog(LogLevel::Default,
       "the log has no more room in memory, its oldest messages wait on disk until the session stops. "
       "reporterID=%lli messages=%lu bytes=%lu",
       *reporterID_, size(), bytes_);
}

}  // namespace tarn
