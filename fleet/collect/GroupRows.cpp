// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/GroupRows.h"

#include <algorithm>
#include <chrono>
#include <set>
#include <tuple>
#include <utility>

#include "plist/Hex.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kVolumeSummary = "sys.oxbow.tarnkit.Volume.Summary";
constexpr std::string_view kMessages = "sys.oxbow.tarnkit.";
constexpr std::string_view kIssue = R"("issue_type":)";
constexpr std::int64_t kMicrosecondsPerDay = 86'400'000'000;

std::string dayText(std::int64_t day) {
  const std::chrono::year_month_day date{std::chrono::sys_days(std::chrono::days(day))};
  const auto two = [](unsigned number) { return (number < 10 ? "-0" : "-") + std::to_string(number); };
  return std::to_string(static_cast<int>(date.year())) + two(static_cast<unsigned>(date.month())) +
         two(static_cast<unsigned>(date.day()));
}

void addReason(CopyRows& rows, bool hasEnded, const std::string& reason) {
  if (hasEnded) {
    rows.text(reason);
  } else {
    rows.null();
  }
}

// In one order, whoever writes: then of two writers with the same records one waits for the other, and never both.
std::vector<const v1::Batch*> inOrder(std::vector<const v1::Batch*> batches) {
  std::stable_sort(batches.begin(), batches.end(), [](const v1::Batch* one, const v1::Batch* other) {
    return std::forward_as_tuple(one->device(), one->first()) < std::forward_as_tuple(other->device(), other->first());
  });
  return batches;
}

}  // namespace

GroupRows::GroupRows(std::vector<const v1::Batch*> batches) : batches_(inOrder(std::move(batches))) {
  std::size_t runs = 0;
  for (const v1::Batch* const batch : batches_) {
    plist::appendHex(names_.emplace_back(), std::string_view(batch->device()));
    firstRun_.push_back(runs);
    runs += static_cast<std::size_t>(batch->runs_size());
  }
}

std::vector<std::string> GroupRows::deviceNames() const {
  const std::set<std::string> each(names_.begin(), names_.end());
  return {each.begin(), each.end()};
}

CopyRows GroupRows::runs() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    for (const v1::Run& run : batches_[i]->runs()) {
      const std::int32_t number = rows.rows();
      rows.begin(10);
      rows.integer(number);
      rows.integer(devices_.at(names_[i]));
      rows.number(run.id());
      rows.text(run.boot());
      rows.text(run.version());
      rows.time(run.started());
      rows.timeOrNull(run.has_ended(), run.ended());
      addReason(rows, run.has_ended(), run.end_reason());
      if (run.machine().empty()) {
        rows.null();
      } else {
        rows.json(run.machine());
      }
      rows.number(batches_[i]->looked_at());
    }
  }
  return rows;
}

CopyRows GroupRows::events() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    const v1::Batch& batch = *batches_[i];
    const std::int32_t device = devices_.at(names_[i]);
    for (const v1::Event& event : batch.events()) {
      const v1::Kind& kind = batch.kinds(static_cast<int>(event.kind()));
      const v1::Session* const session =
          event.session() == 0 ? nullptr : &batch.sessions(static_cast<int>(event.session()) - 1);
      rows.begin(11);
      rows.integer(device);
      rows.number(session == nullptr ? 0 : runs_.at(firstRun_[i] + session->run()));
      rows.number(batch.first() + event.ahead());
      rows.time(event.time());
      if (session == nullptr) {
        rows.null();
      } else {
        rows.number(session->id());
      }
      rows.text(kind.backend());
      rows.text(kind.name());
      rows.json(event.payload());
      rows.json(kind.detail());
      if (isMeasured(kind, event)) {
        rows.text(session == nullptr ? "" : session->application());
        rows.text(session == nullptr ? "" : batch.runs(static_cast<int>(session->run())).version());
      } else {
        rows.null();
        rows.null();
      }
    }
  }
  return rows;
}

CopyRows GroupRows::sessions() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    for (const v1::Session& session : batches_[i]->sessions()) {
      rows.begin(11);
      rows.number(runs_.at(firstRun_[i] + session.run()));
      rows.number(session.id());
      rows.integer(devices_.at(names_[i]));
      rows.text(session.process());
      rows.text(session.application());
      rows.number(session.service_type());
      rows.text(session.service_name());
      rows.time(session.created());
      rows.timeOrNull(session.has_ended(), session.ended());
      addReason(rows, session.has_ended(), session.end_reason());
      rows.number(batches_[i]->looked_at());
    }
  }
  return rows;
}

CopyRows GroupRows::periods() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    for (const v1::Session& session : batches_[i]->sessions()) {
      for (const v1::Period& period : session.periods()) {
        rows.begin(9);
        rows.number(runs_.at(firstRun_[i] + session.run()));
        rows.number(period.id());
        rows.number(session.id());
        rows.integer(devices_.at(names_[i]));
        rows.time(period.started());
        rows.timeOrNull(period.has_stopped(), period.stopped());
        rows.number(period.messages());
        rows.number(period.redundant());
        rows.number(batches_[i]->looked_at());
      }
    }
  }
  return rows;
}

CopyRows GroupRows::gaps() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    for (const v1::Gap& gap : batches_[i]->gaps()) {
      rows.begin(3);
      rows.integer(devices_.at(names_[i]));
      rows.number(gap.first());
      rows.number(gap.last());
    }
  }
  return rows;
}

CopyRows GroupRows::told() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    const v1::Batch& batch = *batches_[i];
    if (batch.last() < batch.first()) continue;
    rows.begin(4);
    rows.integer(devices_.at(names_[i]));
    rows.number(batch.first());
    rows.number(batch.last());
    rows.text(leftOutOf(batch));
  }
  return rows;
}

CopyRows GroupRows::places() const {
  CopyRows rows;
  for (std::size_t i = 0; i < batches_.size(); ++i) {
    if (batches_[i]->last() >= batches_[i]->first()) continue;
    rows.begin(2);
    rows.integer(devices_.at(names_[i]));
    rows.number(batches_[i]->last());
  }
  return rows;
}

std::vector<std::int32_t> GroupRows::devices() const {
  std::vector<std::int32_t> numbers;
  for (const auto& [name, number] : devices_) {
    numbers.push_back(number);
  }
  return numbers;
}

std::vector<std::string> GroupRows::days() const {
  std::set<std::int64_t> days;
  for (const v1::Batch* const batch : batches_) {
    for (const v1::Event& event : batch->events()) {
      days.insert(microsecondsOf(event.time()) / kMicrosecondsPerDay);
    }
  }
  std::vector<std::string> texts;
  std::transform(days.begin(), days.end(), std::back_inserter(texts), dayText);
  return texts;
}

bool isMeasured(const v1::Kind& kind, const v1::Event& event) {
  if (kind.backend() != "tally" || !kind.name().starts_with(kMessages)) return false;
  return kind.name() == kVolumeSummary || event.payload().find(kIssue) != std::string::npos;
}

std::string leftOutOf(const v1::Batch& batch) {
  std::string ranges = "{";
  std::int64_t next = batch.first();
  int gap = 0;
  const auto pass = [&](std::int64_t first, std::int64_t last) {
    if (first > next) {
      ranges += ranges.size() > 1 ? ",[" : "[";
      ranges += std::to_string(next) + ',' + std::to_string(first - 1) + ']';
    }
    next = last + 1;
  };
  const auto passGapsBefore = [&](std::int64_t id) {
    for (; gap < batch.gaps_size() && batch.gaps(gap).first() < id; ++gap) {
      pass(batch.gaps(gap).first(), batch.gaps(gap).last());
    }
  };
  for (const v1::Event& event : batch.events()) {
    const std::int64_t id = batch.first() + event.ahead();
    passGapsBefore(id);
    pass(id, id);
  }
  passGapsBefore(batch.last() + 1);
  pass(batch.last() + 1, batch.last());
  return ranges + "}";
}

}  // namespace tarn::fleet
