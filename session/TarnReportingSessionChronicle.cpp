// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionChronicle.h"

#include <new>

namespace tarn {

namespace {

// What can't be put off: it is left untold without the memory for it.
template <class Tell>
void tellIfPossible(Tell&& tell) noexcept {
  try {
    tell();
  } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): the keeper of the records counts it
  }
}

}  // namespace

TarnReportingSessionChronicle::TarnReportingSessionChronicle(platform::SessionRecords* records,
                                                             const platform::SessionFacts& facts)
    : records_(records), number_(records == nullptr ? 0 : records->created(facts)) {}

void TarnReportingSessionChronicle::describe(const platform::SessionFacts& facts) {
  if (records_ != nullptr) {
    records_->described(number_, facts);
  }
}

void TarnReportingSessionChronicle::start() {
  if (records_ == nullptr || state_ == State::Running || state_ == State::Ended) return;
  records_->started(number_);
  state_ = State::Running;
  messages_ = 0;
  redundant_ = 0;
}

// Of what comes between a stop and a start nothing else is kept either.
void TarnReportingSessionChronicle::countRepeated(const plist::Dictionary& message) {
  if (state_ == State::Running) {
    records_->repeated(number_, message);
  }
  ++messages_;
  ++redundant_;
}

void TarnReportingSessionChronicle::stop() noexcept {
  if (state_ != State::Running) return;
  state_ = State::Stopped;
  tellIfPossible([this] { records_->stopped(number_, messages_, redundant_); });
}

void TarnReportingSessionChronicle::end(platform::SessionEnd end) noexcept {
  if (records_ == nullptr || state_ == State::Ended) return;
  stop();
  state_ = State::Ended;
  tellIfPossible([this, end] { records_->ended(number_, end); });
}

}  // namespace tarn
