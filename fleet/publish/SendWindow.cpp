// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/SendWindow.h"

#include <algorithm>
#include <utility>

namespace tarn::fleet {

void SendWindow::add(std::string id, std::string bytes, Cursor after) {
  bytes_ += bytes.size();
  entries_.push_back({std::move(id), std::move(bytes), std::move(after), State::Waits, {}});
}

void SendWindow::giveUpOn(Entry& entry) {
  entry.state = State::Waits;
  --sent_;
}

void SendWindow::failed(const std::string& why, Time now) {
  counts_.lastError = why;
  // Failures of tries that were made before the pause began say nothing new.
  if (now >= pausedUntil_) {
    pausedUntil_ = now + backoff_.next();
  }
}

void SendWindow::send(Time now) {
  for (Entry& entry : entries_) {
    if (entry.state == State::Sent && now >= entry.until) {
      ++counts_.unanswered;
      giveUpOn(entry);
      failed("no answer within " + std::to_string(limits_.patience.count() / 1000) + " s", now);
    }
  }
  for (std::size_t i = 0; i < entries_.size() && now >= pausedUntil_; ++i) {
    Entry& entry = entries_[i];
    if (entry.state != State::Waits) continue;
    if (backoff_.failures() > 0 && sent_ > 0) return;
    if (const Status taken = publisher_.publish(first_ + i, entry.id, entry.bytes); taken.failed()) {
      ++counts_.refused;
      failed(taken->text, now);
      return;
    }
    entry.state = State::Sent;
    entry.until = now + limits_.patience;
    ++sent_;
  }
}

void SendWindow::take(const std::vector<Outcome>& outcomes, Time now) {
  for (const Outcome& outcome : outcomes) {
    // One of a message that has left the window is a late word of an earlier try.
    if (outcome.number < first_ || outcome.number - first_ >= entries_.size()) continue;
    Entry& entry = entries_[static_cast<std::size_t>(outcome.number - first_)];
    if (entry.state == State::Arrived) continue;
    if (outcome.status.ok()) {
      sent_ -= entry.state == State::Sent ? 1 : 0;
      entry.state = State::Arrived;
      ++counts_.arrived;
      backoff_.succeeded();
      pausedUntil_ = {};
    } else if (entry.state == State::Sent) {
      ++counts_.refused;
      giveUpOn(entry);
      failed(outcome.status->text, now);
    }
  }
}

std::optional<Cursor> SendWindow::settled() {
  std::optional<Cursor> cursor;
  while (!entries_.empty() && entries_.front().state == State::Arrived) {
    bytes_ -= entries_.front().bytes.size();
    cursor = std::move(entries_.front().after);
    entries_.pop_front();
    ++first_;
  }
  return cursor;
}

std::optional<SendWindow::Time> SendWindow::due() const {
  std::optional<Time> due;
  // While one message alone is on its way the others wait for its outcome.
  const bool isTrial = backoff_.failures() > 0 && sent_ > 0;
  const auto consider = [&due](Time time) { due = due ? std::min(*due, time) : time; };
  for (const Entry& entry : entries_) {
    if (entry.state == State::Sent) {
      consider(entry.until);
    } else if (entry.state == State::Waits && !isTrial) {
      consider(pausedUntil_);
    }
  }
  return due;
}

}  // namespace tarn::fleet
