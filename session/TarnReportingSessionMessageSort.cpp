// SPDX-License-Identifier: Apache-2.0
// How TarnReportingSessionMessageList sorts what doesn't fit into memory.
//
// Clients nearly always send in time order, so what is in order is left alone. Pages in a row whose times don't overlap
// are one run, and the runs are merged. A page that nothing else falls into goes over as it is, without being read; one
// that overlaps with others is read when its time comes. So a marker of the stop that is older than all messages costs
// one page, messages of two threads that are a little out of order cost one pass over them, and only what lies in no
// order at all is sorted in runs first.
#include <algorithm>
#include <functional>
#include <iterator>
#include <limits>
#include <queue>
#include <utility>
#include <vector>

#include "session/TarnReportingSessionMessageList.h"

namespace tarn {

namespace {

// Pages that a merge reads at once, and of a sort in runs what is sorted at once.
constexpr std::size_t kMostOpen = 64;

using Pages = std::vector<std::shared_ptr<const TarnReportingSessionMessagePage>>;

bool follows(const TarnReportingSessionMessagePage& page, const TarnReportingSessionMessagePage& earlier) {
  return earlier.contents().latest <= page.contents().earliest;
}

// How many pages there are at the most that have messages before and after the same moment.
std::size_t mostOverlapping(const Pages& pages) {
  std::vector<std::pair<double, int>> ends;  // what begins at a moment counts before what ends at it
  for (const auto& page : pages) {
    ends.emplace_back(page->contents().earliest, -1);
    ends.emplace_back(page->contents().latest, 1);
  }
  std::sort(ends.begin(), ends.end());
  std::ptrdiff_t now = 0;
  std::ptrdiff_t most = 0;
  for (const auto& [time, end] : ends) {
    now -= end;
    most = std::max(most, now);
  }
  return static_cast<std::size_t>(most);
}

}  // namespace

// Records in order: those of the page that was read, those of further pages, then the rest. A page is put in order when
// it is read.
struct TarnReportingSessionMessageList::Run {
  TarnReportingSessionMessages open;
  Pages pages;
  std::size_t next = 0;
  TarnReportingSessionMessages rest;

  bool hasPage() const noexcept { return open.empty() && next < pages.size(); }
  bool empty() const noexcept { return open.empty() && next == pages.size() && rest.empty(); }
  // Of its first record.
  double time() const {
    return hasPage() ? pages[next]->contents().earliest : (open.empty() ? rest : open).front()->sortingTime();
  }
  std::shared_ptr<const Page> takePage() { return std::move(pages[next++]); }
  void read(const Page& page) {
    std::vector<Record> records = page.read();
    open.assign(std::make_move_iterator(records.begin()), std::make_move_iterator(records.end()));
    if (!page.contents().isSorted) {
      TarnReportingSessionMessage::sortMessages(open);
    }
  }
  Record takeRecord() {
    TarnReportingSessionMessages& from = open.empty() ? rest : open;
    Record record = std::move(from.front());
    from.pop_front();
    return record;
  }
};

bool TarnReportingSessionMessageList::sort() {
  if (empty()) return false;
  if (parts_.empty()) return TarnReportingSessionMessage::sortMessages(*recent_);
  if (isSorted()) return false;
  sortPages();
  return true;
}

bool TarnReportingSessionMessageList::isSorted() const {
  double last = parts_.front().page->contents().earliest;
  for (const Part& part : parts_) {
    const Page::Contents& contents = part.page->contents();
    if (part.isLost || !contents.isSorted || contents.earliest < last) return false;
    last = contents.latest;
  }
  return std::all_of(recent().begin(), recent().end(), [&](const Record& record) {
    const double time = record->sortingTime();
    return std::exchange(last, time) <= time;
  });
}

void TarnReportingSessionMessageList::sortPages() {
  Pages all = pages();
  TarnReportingSessionMessages recent;
  if (recent_) {
    TarnReportingSessionMessage::sortMessages(*recent_);
    recent.swap(*recent_);
  }
  const bool wasTold = isTold_;
  clear();
  isTold_ = wasTold;
  double latest = -std::numeric_limits<double>::infinity();
  for (const auto& page : all) {
    latest = std::max(latest, page->contents().latest);
  }
  const auto after =
      std::find_if(recent.begin(), recent.end(), [&](const Record& record) { return record->sortingTime() >= latest; });
  std::vector<Run> runs;
  if (mostOverlapping(all) > kMostOpen) {
    runs = sortedRuns(std::move(all));
  } else {
    for (auto& page : all) {
      if (runs.empty() || !follows(*page, *runs.back().pages.back())) {
        runs.emplace_back();
      }
      runs.back().pages.push_back(std::move(page));
    }
  }
  runs.emplace_back().rest.assign(std::make_move_iterator(recent.begin()), std::make_move_iterator(after));
  merge(runs);
  std::for_each(after, recent.end(), [&](Record& record) { append(std::move(record)); });
}

// Each as long as the memory allows; the pages go as they are read.
std::vector<TarnReportingSessionMessageList::Run> TarnReportingSessionMessageList::sortedRuns(Pages pages) const {
  std::vector<Run> runs;
  for (std::size_t begin = 0; begin < pages.size(); begin += kMostOpen) {
    TarnReportingSessionMessages records;
    for (std::size_t each = begin; each < std::min(begin + kMostOpen, pages.size()); ++each) {
      const std::shared_ptr<const Page> page = std::move(pages[each]);
      std::vector<Record> read = page->read();
      std::move(read.begin(), read.end(), std::back_inserter(records));
    }
    TarnReportingSessionMessage::sortMessages(records);
    TarnReportingSessionMessageList list;
    for (Record& record : records) {
      list.append(std::move(record));
    }
    list.moveAll();
    runs.push_back({{}, list.pages(), 0, {}});
    if (list.recent_) {
      runs.back().rest.swap(*list.recent_);
    }
  }
  return runs;
}

// Merges the runs into this list, which is empty; the earlier run first where times are equal.
void TarnReportingSessionMessageList::merge(std::vector<Run>& runs) {
  using Next = std::pair<double, std::size_t>;
  std::priority_queue<Next, std::vector<Next>, std::greater<>> queue;
  const auto enqueue = [&](std::size_t run) {
    if (!runs[run].empty()) {
      queue.emplace(runs[run].time(), run);
    }
  };
  for (std::size_t run = 0; run < runs.size(); ++run) {
    enqueue(run);
  }
  while (!queue.empty()) {
    const std::size_t first = queue.top().second;
    queue.pop();
    Run& run = runs[first];
    if (!run.hasPage()) {
      append(run.takeRecord());
      // What lay on disk needn't fill the memory again.
      while (firstChunk_ < chunks_.size() && memory_->mayTry() && moveOldest()) {
      }
    } else {
      std::shared_ptr<const Page> page = run.takePage();
      const bool isAlone = queue.empty() || Next(page->contents().latest, first) < queue.top();
      if (isAlone && page->contents().isSorted && moveAll()) {
        addPart(std::move(page));
      } else {
        run.read(*page);
      }
    }
    enqueue(first);
  }
}

}  // namespace tarn
