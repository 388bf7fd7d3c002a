// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionTags.h"

#include <array>

#include "session/TarnReportingSessionKeys.h"

namespace tarn {

TarnReportingSessionTags::TarnReportingSessionTags() : places_(std::make_unique<Known[]>(kPlaces)) {}

TarnReportingSessionTags::~TarnReportingSessionTags() = default;

TarnReportingSessionTags::Known& TarnReportingSessionTags::placeOf(std::uint64_t keysHash,
                                                                   TarnReportingSessionMessage::Kind kind,
                                                                   const plist::Key& application) noexcept {
  const std::uint64_t mixed = plist::KeyList::combineHash(keysHash ^ application.hash(), kind);
  return places_[mixed % kPlaces];
}

void TarnReportingSessionTags::learn(Known& known, const plist::KeyList& keys, AudioEventCategory category,
                                     AudioEventType type, const plist::Key& application) {
  std::string tag = TarnReportingUtilityCategoryString(category);
  tag += TarnReportingUtilityTypeString(type);
  const std::array<plist::Dictionary::Entry, 2> entries{
      {{keys::kAudioTag, tag}, {keys::kHostApplicationDisplayID, application.text()}}};
  Known learned{
      keys, application, TarnReportingSessionMessage::kindOf(category, type), {}, keys.indexOf(keys::kTimestamp)};
  learned.added = plist::PackedBuilder::Addition(keys, entries);
  known = std::move(learned);
}

bool TarnReportingSessionTags::addTo(plist::Dictionary& payload, AudioEventCategory category, AudioEventType type,
                                     const plist::Key& application) {
  const auto kind = TarnReportingSessionMessage::kindOf(category, type);
  Known& known = placeOf(payload.keysHash(), kind, application);
  if (!payload.hasKeys(known.keys) || known.kind != kind || !(known.application == application)) {
    if (payload.size() > kMostKeys) return false;
    learn(known, payload.keys(), category, type, application);
  }
  if (!known.added.isFor(payload)) return false;
  known.added.addTo(payload);
  return true;
}

const TarnReportingSessionTags::Known* TarnReportingSessionTags::find(const Draft& draft, AudioEventCategory category,
                                                                      AudioEventType type,
                                                                      const plist::Key& application) {
  const auto kind = TarnReportingSessionMessage::kindOf(category, type);
  Known& known = placeOf(draft.keys().hash(), kind, application);
  if (!(known.keys == draft.keys()) || known.kind != kind || !(known.application == application)) {
    if (draft.keys().size() > kMostKeys) return nullptr;
    learn(known, draft.keys(), category, type, application);
  }
  const bool isPlain = known.added.isFor(draft) && known.stamp != plist::KeyList::npos && !draft.keys().hasBlanks();
  return isPlain ? &known : nullptr;
}

}  // namespace tarn
