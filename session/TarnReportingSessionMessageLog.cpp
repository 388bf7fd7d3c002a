// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionMessageLog.h"

namespace tarn {

void TarnReportingSessionMessageLog::setAccount(std::shared_ptr<TarnReportingSessionLogAccount> account) {
  account_ = std::move(account);
  if (body_) {
    body_->messages.setAccount(account_);
  }
}

const TarnReportingSessionMessageList& TarnReportingSessionMessageLog::messages() const noexcept {
  static const TarnReportingSessionMessageList kEmpty;
  return body_ ? body_->messages : kEmpty;
}

void TarnReportingSessionMessageLog::append(Record record) {
  if (!body_) {
    body_ = std::make_unique<Body>(reporterID_);
    body_->messages.setAccount(account_);
  }
  // The place first: what points to the record must not outlive one that found no room.
  const auto [place, isNew] = body_->newest.try_emplace(record->kind());
  const std::size_t index = body_->messages.size();
  const TarnReportingSessionMessage* const recent = record.get();
  try {
    body_->messages.append(std::move(record));
  } catch (...) {
    if (isNew) {
      body_->newest.erase(place);
    }
    throw;
  }
  body_->note(place->second, index, recent);
}

void TarnReportingSessionMessageLog::Body::note(Newest& ofTheKind, std::size_t index,
                                                const TarnReportingSessionMessage* recent) noexcept {
  ofTheKind.index = index;
  ofTheKind.recent = recent;
  if (ofTheKind.kept) [[unlikely]] {
    ofTheKind.kept.reset();
    --kept;
  }
}

void TarnReportingSessionMessageLog::sort() {
  if (!body_) return;
  try {
    if (!body_->messages.sort()) return;
  } catch (...) {  // for want of memory; records that are pointed to may be gone
    body_->forgetPlaces(0);
    throw;
  }
  body_->forgetPlaces(body_->messages.size());
}

void TarnReportingSessionMessageLog::clear() {
  body_.reset();
}

const TarnReportingSessionMessage* TarnReportingSessionMessageLog::newest(AudioEventCategory category,
                                                                          AudioEventType type) const {
  if (!body_) return nullptr;
  Body& body = *body_;
  const auto found = body.newest.find(TarnReportingSessionMessage::kindOf(category, type));
  if (found == body.newest.end()) return nullptr;
  Newest& newest = found->second;
  if (newest.index == kNone) [[unlikely]] {
    body.lookFor(newest);
  }
  if (newest.index >= body.messages.overflowed()) return newest.recent;
  // A producer may have changed what was read back.
  if (body.changesSeen != body.messages.changes()) {
    body.changesSeen = body.messages.changes();
    body.forgetKept();
  }
  if (newest.kept) return newest.kept.get();
  body.looked = body.messages.readAlone(newest.index);
  if (body.looked && body.kept < kMostKept) {
    newest.kept = body.looked;
    ++body.kept;
  }
  return body.looked.get();
}

// The kinds stay: each that the log has is known.
void TarnReportingSessionMessageLog::Body::forgetPlaces(std::size_t unseenRecords) noexcept {
  for (auto& [kind, ofTheKind] : newest) {
    ofTheKind = {};
  }
  kept = 0;
  unseen = unseenRecords;
}

void TarnReportingSessionMessageLog::Body::lookFor(const Newest& sought) {
  const auto isMissing = [this](TarnReportingSessionMessage::Kind kind) { return newest[kind].index == kNone; };
  messages.goBack(unseen, isMissing, [&](std::size_t index, const Record& record) {
    Newest& ofTheKind = newest[record->kind()];
    if (ofTheKind.index == kNone) {
      const bool isKept = index < messages.overflowed() && kept < kMostKept;
      ofTheKind = {index, record.get(), isKept ? record : nullptr};
      kept += isKept ? 1 : 0;
    }
    unseen = index;
    return sought.index == kNone;
  });
  if (sought.index == kNone) {
    unseen = 0;  // it lay in a page that is lost
  }
}

void TarnReportingSessionMessageLog::Body::forgetKept() {
  for (auto& [kind, ofTheKind] : newest) {
    ofTheKind.kept.reset();
  }
  kept = 0;
}

}  // namespace tarn
