// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/Exporter.h"

#include <algorithm>
#include <iterator>
#include <utility>

namespace tarn::fleet {

namespace {

constexpr std::size_t kRowsAtOnce = 2000;
constexpr double kMicroseconds = 1e6;
// Sessions that haven't ended are looked at again this often.
constexpr std::chrono::seconds kBetweenLooks{10};
// What arrived within it is noted at once.
constexpr std::chrono::milliseconds kBetweenWrites{100};
// The oldest are let go of: their end isn't told then unless they say something more.
constexpr std::size_t kMostOpen = 4096;
// What is asked for meanwhile is answered together: several ask for the same.
constexpr std::chrono::seconds kBetweenAnswers{10};
// After so long without anything new it says how far it is.
constexpr std::chrono::seconds kQuiet{30};

// Whether there is something to tell of the session that wasn't.
bool isNews(const StoredSession& stored) {
  return stored.session.ended.has_value();
}

}  // namespace

Result<std::string> Exporter::begin() {
  Result<ReadCursor> read = cursorFile_.read();
  if (read.failed()) return {{}, std::move(read.error)};
  written_ = next_ = std::move(read.value.cursor);
  if (Status told = arrivedFile_.write(written_.event); told.failed()) return {{}, std::move(told)};
  return {std::move(read.value.remark), {}};
}

Status Exporter::step(const ExportClock& now, std::chrono::milliseconds longest) {
  Status read = fill(now);
  Status settled = settle(now, longest);
  return read.failed() ? read : settled;
}

Status Exporter::settle(const ExportClock& now, std::chrono::milliseconds longest) {
  window_.send(now.monotonic);
  if (const auto due = window_.due()) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(*due - now.monotonic);
    longest = std::clamp(left, std::chrono::milliseconds(0), longest);
  }
  std::vector<Outcome> outcomes;
  publisher_.wait(window_.isEmpty() ? std::chrono::milliseconds(0) : longest, outcomes);
  window_.take(outcomes, now.monotonic);
  if (std::optional<Cursor> settled = window_.settled()) {
    settled_ = std::move(settled);
  }
  if (settled_ && (window_.isEmpty() || now.monotonic >= nextWrite_)) {
    nextWrite_ = now.monotonic + kBetweenWrites;
    if (Status written = cursorFile_.write(*settled_); written.failed()) return written;
    written_ = *std::exchange(settled_, std::nullopt);
    return arrivedFile_.write(written_.event);
  }
  return {};
}

Status Exporter::fill(const ExportClock& now) {
  sieve_.setTime(now.epochSeconds);
  isAtTheEnd_ = false;
  Status status;
  while (status.ok() && window_.hasRoom() && !isAtTheEnd_) {
    status = readPage(now);
  }
  if (status.ok() && isAtTheEnd_ && window_.hasRoom() && now.monotonic >= nextLook_) {
    nextLook_ = now.monotonic + kBetweenLooks;
    status = lookAtOpen(now);
  }
  if (status.ok() && publisher_.hasAsker()) {
    status = serveAsker(now);
  }
  store_.rest();
  return status;
}

std::int64_t Exporter::lookedAt(const ExportClock& now) {
  // Also where the clock was set back.
  next_.lookedAt = std::max(static_cast<std::int64_t>(now.epochSeconds * kMicroseconds), next_.lookedAt + 1);
  return next_.lookedAt;
}

Status Exporter::checkMark() {
  if (isMarkChecked_) return {};
  isMarkChecked_ = true;
  if (next_.mark.run == 0) return {};
  const Result<StoreMark> mark = store_.markOf(next_.mark.run);
  if (mark.failed()) return mark.error;
  if (mark.value != next_.mark) {
    next_.event = 0;
    next_.open.clear();
    next_.mark = {};
  }
  return {};
}

Status Exporter::readPage(const ExportClock& now) {
  if (!isMarkChecked_) {
    // A store without sessions yet has nothing that could be another's.
    if (store_.look().ok()) {
      if (Status checked = checkMark(); checked.failed()) return checked;
    }
  }
  const Result<recorder::EventPage> page = store_.read(next_.event, kRowsAtOnce);
  if (page.failed()) return page.error;
  if (page.value.missing || page.value.rows.empty()) {
    isAtTheEnd_ = true;
    if (!page.value.missing && page.value.lookedUpTo < next_.event) {
      next_.event = page.value.lookedUpTo;  // another file
    }
    return {};
  }
  if (page.value.rows.front().id <= next_.event) {
    next_.event = page.value.rows.front().id - 1;  // another file, whose ids begin anew
    next_.open.clear();
  }
  if (Status looked = store_.look(); looked.failed()) return looked;
  Result<MadeBatch> made = maker_.make(page.value.rows, next_.event, lookedAt(now), store_);
  if (made.failed()) return made.error;
  isAtTheEnd_ = !page.value.more && made.value.batch.last() >= page.value.lookedUpTo;
  return add(std::move(made.value));
}

Status Exporter::lookAtOpen(const ExportClock& now) {
  if (next_.open.empty()) return {};
  if (Status looked = store_.look(); looked.failed()) return looked;
  std::vector<std::int64_t> news;
  for (const std::int64_t id : next_.open) {
    const Result<std::optional<StoredSession>> found = store_.find(id);
    if (found.failed()) return found.error;
    if (!found.value || isNews(*found.value)) {
      news.push_back(id);
    }
  }
  if (news.empty()) return {};
  Result<MadeBatch> made = maker_.makeOfSessions(news, next_.event, lookedAt(now), store_);
  if (made.failed()) return made.error;
  std::vector<std::int64_t> left;
  std::set_difference(next_.open.begin(), next_.open.end(), news.begin(), news.end(), std::back_inserter(left));
  next_.open = std::move(left);
  return add(std::move(made.value));
}

// A page at a time, so that what is new isn't held up.
Status Exporter::serveAsker(const ExportClock& now) {
  if (window_.hasRoom()) {
    takeAsked(now);
    if (Status answered = answer(now); answered.failed()) return answered;
  }
  return tellPlace(now);
}

void Exporter::takeAsked(const ExportClock& now) {
  if (!asked_.empty() || now.monotonic < nextAsked_) return;
  nextAsked_ = now.monotonic + kBetweenAnswers;
  std::vector<recorder::IdRange> asked;
  publisher_.asked(asked);
  std::sort(asked.begin(), asked.end(), [](const auto& one, const auto& other) { return one.first < other.first; });
  for (const recorder::IdRange& range : asked) {
    // What is beyond comes by itself.
    if (range.first >= 1 && range.first <= next_.event) {
      recorder::addRange(asked_, {range.first, std::min(range.last, next_.event)});
    }
  }
  askedAgain_ += recorder::countOf(asked_);
}

Status Exporter::answer(const ExportClock& now) {
  if (asked_.empty()) return {};
  recorder::IdRange& ids = asked_.front();
  Result<recorder::EventPage> page = store_.readEarlier(ids.first - 1, kRowsAtOnce);
  if (page.failed()) return page.error;
  std::vector<recorder::EventRow>& rows = page.value.rows;
  if (page.value.missing || page.value.lookedUpTo < ids.first) {
    asked_.clear();  // another store, which has none of them
    return {};
  }
  if (Status looked = store_.look(); looked.failed()) return looked;
  std::erase_if(rows, [&ids](const recorder::EventRow& row) { return row.id < ids.first || row.id > ids.last; });
  Result<MadeBatch> made = maker_.makeAgain(rows, ids, page.value.lookedUpTo >= ids.last, lookedAt(now), store_);
  if (made.failed()) return made.error;
  // Under a name of its own: who lost the message may still know its name, and drop it as one that comes twice.
  Result<PackedMessage> message = packer_.pack(made.value.batch);
  if (message.failed()) return message.error;
  window_.add(message.value.id + "." + std::to_string(next_.lookedAt), std::move(message.value.bytes), next_);
  ids.first = made.value.batch.last() + 1;
  if (ids.first > ids.last) {
    asked_.erase(asked_.begin());
  }
  return {};
}

Status Exporter::tellPlace(const ExportClock& now) {
  if (!isAtTheEnd() || settled_) {
    quietSince_.reset();
    return {};
  }
  if (!quietSince_) {
    quietSince_ = now.monotonic;
  }
  if (now.monotonic - *quietSince_ < kQuiet || next_.event == toldPlace_) return {};
  Result<MadeBatch> made = maker_.makeOfSessions({}, next_.event, lookedAt(now), store_);
  if (made.failed()) return made.error;
  toldPlace_ = next_.event;
  return add(std::move(made.value));
}

void Exporter::noteMark(const v1::Batch& batch) {
  for (const v1::Run& run : batch.runs()) {
    if (run.id() >= next_.mark.run) {
      next_.mark = {run.id(), run.boot(), run.started()};
    }
  }
}

Status Exporter::add(MadeBatch made) {
  Result<PackedMessage> message = packer_.pack(made.batch);
  if (message.failed()) return message.error;
  next_.event = made.batch.last();
  noteMark(made.batch);
  for (const v1::Session& session : made.batch.sessions()) {
    const auto place = std::lower_bound(next_.open.begin(), next_.open.end(), session.id());
    const bool isThere = place != next_.open.end() && *place == session.id();
    const bool isOpen = std::find(made.open.begin(), made.open.end(), session.id()) != made.open.end();
    if (isThere && !isOpen) {
      next_.open.erase(place);
    } else if (!isThere && isOpen) {
      next_.open.insert(place, session.id());
    }
  }
  if (next_.open.size() > kMostOpen) {
    next_.open.erase(next_.open.begin());
  }
  window_.add(std::move(message.value.id), std::move(message.value.bytes), next_);
  return {};
}

}  // namespace tarn::fleet
