#include "session/TarnReportingSessionMessageList.h"

#include <algorithm>
#include <queue>
#include <tuple>

#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingLog.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSessionMessageList"};

// Of a sort beyond the memory: what is sorted at once.
constexpr std::size_t kChunksOfRun = 64;

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
  if (account_) {
    account_->bytes -= bytes_;
  }
  account_ = std::move(account);
  if (account_) {
    account_->bytes += bytes_;
  }
}

void TarnReportingSessionMessageList::append(Record record) {
  if (!memory_) [[unlikely]] {
    memory_ = ProcessState::of<TarnReportingSessionLogMemory>();
  }
  const std::size_t cost = memory_->costOf(*record);
  recent_.push_back(std::move(record));
  memory_->add(*this, cost);
  ++openChunk_.records;
  openChunk_.bytes += cost;
  if (openChunk_.bytes >= memory_->chunkBytes_) {
    chunks_.push_back(openChunk_);
    openChunk_ = {};
  }
  memory_->relieve(*this);
}

void TarnReportingSessionMessageList::clear() {
  recent_ = TarnReportingSessionMessages();  // gives the memory back too
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
  if (pins_ > 0 || recent_.empty()) return false;
  const Chunk chunk = firstChunk_ < chunks_.size() ? chunks_[firstChunk_] : openChunk_;
  const auto end = recent_.begin() + static_cast<std::ptrdiff_t>(chunk.records);
  Page::Maker maker(chunk.bytes);
  std::for_each(recent_.begin(), end, [&](const Record& record) { maker.add(*record); });
  auto page = maker.finish(*memory_->store_, memory_->pageCounts_);
  if (page.failed()) {
    memory_->toldFailure(*page.error);
    return false;
  }
  memory_->toldSuccess();
  parts_.push_back({std::move(page.value), overflowed_});
  if (overflowed_ == 0) {
    ++memory_->overflowing_;
    tellOverflow();
  }
  overflowed_ += chunk.records;
  recent_.erase(recent_.begin(), end);
  if (firstChunk_ == chunks_.size()) {
    openChunk_ = {};
  } else if (++firstChunk_ == chunks_.size()) {
    chunks_.clear();
    firstChunk_ = 0;
  }
  memory_->subtract(*this, chunk.bytes);
  return true;
}

void TarnReportingSessionMessageList::moveAll() {
  while (memory_->mayTry() && moveOldest()) {
  }
}

void TarnReportingSessionMessageList::tellOverflow() {
  if (!reporterID_ || std::exchange(isTold_, true)) return;
  kLog(LogLevel::Default,
       "the log has no more room in memory, its oldest messages wait on disk until the session stops. "
       "reporterID=%lli messages=%lu bytes=%lu",
       *reporterID_, size(), bytes_);
}

bool TarnReportingSessionMessageList::sort() {
  if (parts_.empty()) {
    TarnReportingSessionMessage::sortMessages(recent_);
    return true;
  }
  if (isSorted()) return false;
  std::vector<TarnReportingSessionMessageList> runs = sortedRuns();
  merge(runs);
  return true;
}

bool TarnReportingSessionMessageList::isSorted() const {
  double last = parts_.front().page->firstTime();
  for (const Part& part : parts_) {
    if (part.isLost || !part.page->isSorted() || part.page->firstTime() < last) return false;
    last = part.page->lastTime();
  }
  for (const Record& record : recent_) {
    const double time = record->sortingTime();
    if (time < last) return false;
    last = time;
  }
  return true;
}

// Cuts the list into lists that are sorted, and leaves nothing in it.
std::vector<TarnReportingSessionMessageList> TarnReportingSessionMessageList::sortedRuns() {
  const std::size_t longest = memory_->chunkBytes_ * kChunksOfRun;
  std::vector<TarnReportingSessionMessageList> runs;
  TarnReportingSessionMessages run;
  std::size_t bytes = 0;
  const auto finishRun = [&] {
    TarnReportingSessionMessage::sortMessages(run);
    TarnReportingSessionMessageList& made = runs.emplace_back();
    for (Record& record : run) {
      made.append(std::move(record));
    }
    made.moveAll();
    run.clear();
    bytes = 0;
  };
  const auto take = [&](const Record& record) {
    bytes += memory_->costOf(*record);
    run.push_back(record);
    if (bytes >= longest) {
      finishRun();
    }
  };
  moveAll();
  ++pins_;  // appending to the runs must not move what is gone through
  for (std::size_t part = 0; part < parts_.size(); ++part) {
    const std::vector<Record> records = open(part).records;
    dropPart(part);
    std::for_each(records.begin(), records.end(), take);
  }
  std::for_each(recent_.begin(), recent_.end(), take);
  --pins_;
  if (!run.empty()) {
    finishRun();
  }
  return runs;
}

// Gives back what a part takes in the store; nothing of it is looked at again.
void TarnReportingSessionMessageList::dropPart(std::size_t part) {
  for (Opened& opened : opened_) {
    if (opened.part == part) {
      opened = {};
    }
  }
  parts_[part].page.reset();
}

// Merges the runs into this list, the earlier run first where times are equal.
void TarnReportingSessionMessageList::merge(std::vector<TarnReportingSessionMessageList>& runs) {
  const bool wasTold = isTold_;
  clear();
  isTold_ = wasTold;
  // The time of a run's next record, the run, and the record's place.
  using Next = std::tuple<double, std::size_t, std::size_t>;
  std::priority_queue<Next, std::vector<Next>, std::greater<>> queue;
  const auto enqueue = [&](std::size_t run, std::size_t index) {
    TarnReportingSessionMessageList& from = runs[run];
    while (index < from.size()) {
      if (const Record record = from[index]) {
        queue.emplace(record->sortingTime(), run, index);
        return;
      }
      ++index;
    }
  };
  for (std::size_t run = 0; run < runs.size(); ++run) {
    enqueue(run, 0);
  }
  while (!queue.empty()) {
    const auto [time, run, index] = queue.top();
    queue.pop();
    append(runs[run][index]);
    enqueue(run, index + 1);
  }
}

}  // namespace tarn
