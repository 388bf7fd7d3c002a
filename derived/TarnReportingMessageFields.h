// SPDX-License-Identifier: Apache-2.0
// TarnReportingMessageFields: the few values of a payload that a walk over a session's messages looks at, read once a
// message, or the running state that such messages are laid over one after the other.
//
// `Field` is an enumeration that numbers the values from 0, with `Count` after the last. The values lie in the payload
// (or wherever they were set from), which must stay as it is meanwhile, or until keepIn(). A payload is never copied: a
// state of all its keys, merged for every message, would cost more than everything else at a session's stop.
//
// Threads: the server queue.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <span>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "plist/Key.h"
#include "plist/KeyList.h"
#include "plist/Value.h"
#include "plist/ValueView.h"

namespace tarn {

template <class Field>
class TarnReportingMessageFieldReader;

// A look at a handful of values: it is copied cheaply and owns nothing, apart from what keepIn() was given to hold.
template <class Field>
class TarnReportingMessageFields {
 public:
  static constexpr std::size_t kCount = static_cast<std::size_t>(Field::Count);
  // The key of each field in payloads, in the order of Field.
  using Keys = std::array<plist::Key, kCount>;

  // Every field absent.
  TarnReportingMessageFields() = default;
  // `source`: a payload, or whatever else has values under keys. A look-up a key: for what is read once. The reader
  // below is for what is read message by message.
  template <class Source>
  TarnReportingMessageFields(const Keys& keys, const Source& source) noexcept {
    std::transform(keys.begin(), keys.end(), values_.begin(), [&](const plist::Key& key) { return source.get(key); });
  }

  // Absent when the payload doesn't hold it.
  const plist::ValueView& operator[](Field field) const noexcept { return values_[static_cast<std::size_t>(field)]; }
  plist::ValueView& operator[](Field field) noexcept { return values_[static_cast<std::size_t>(field)]; }

  // Takes over every value that the later payload holds. Fields that it doesn't hold stay.
  void merge(const TarnReportingMessageFields& later) noexcept {
    std::transform(
        later.values_.begin(), later.values_.end(), values_.begin(), values_.begin(),
        [](const plist::ValueView& theirs, const plist::ValueView& own) { return theirs.present() ? theirs : own; });
  }

  // Copies the values and looks at the copies from now on; what they lay in may go.
  using Kept = std::array<plist::Value, kCount>;
  // `kept` outlives the fields, and may hold what they look at already.
  void keepIn(Kept& kept) {
    for (std::size_t field = 0; field < kCount; ++field) {
      plist::Value copy(values_[field]);  // the old value may lie in its own place
      kept[field] = std::move(copy);
      values_[field] = kept[field].view();
    }
  }

 private:
  friend class TarnReportingMessageFieldReader<Field>;

  std::array<plist::ValueView, kCount> values_;
};

// TarnReportingMessageFieldReader: reads the fields of one payload after the other.
//
// Messages come in a few shapes over and over. Where the fields lie in a key list is remembered, for a bounded number
// of lists, so that a payload is passed over once and only as far as its last field, and no key is looked for.
//
// `keys` outlives the reader. Threads: the server queue. One a walk: what it remembers is worth nothing beyond the log
// that it goes through.
template <class Field>
class TarnReportingMessageFieldReader {
 public:
  using Fields = TarnReportingMessageFields<Field>;

  explicit TarnReportingMessageFieldReader(const typename Fields::Keys& keys) : keys_(keys) {}

  // The fields look into the payload.
  Fields read(const plist::Dictionary& payload) {
    Fields fields;
    payload.pick(picksOf(payload), fields.values_);
    return fields;
  }

 private:
  // Where the fields of a key list lie, those that it has.
  struct Shape {
    plist::KeyList keys;
    std::vector<plist::Dictionary::Pick> picks;
  };

  // More shapes than a session's messages usually have. Two that share a slot push each other out and cost a pass over
  // their keys each time, and nothing else.
  static constexpr std::size_t kSlots = 128;

  // Compares the whole key list, as two lists may have the same hash.
  std::span<const plist::Dictionary::Pick> picksOf(const plist::Dictionary& payload) {
    Shape& slot = slots_[payload.keysHash() % kSlots];
    if (!payload.hasKeys(slot.keys)) {
      slot = {payload.keys(), {}};
      std::size_t skipped = 0;
      for (std::size_t place = 0; place < slot.keys.size(); ++place) {
        const auto field = std::find(keys_.begin(), keys_.end(), slot.keys[place]);
        if (field == keys_.end()) {
          ++skipped;
        } else {
          slot.picks.push_back({std::exchange(skipped, 0), static_cast<std::size_t>(field - keys_.begin())});
        }
      }
    }
    return slot.picks;
  }

  const typename Fields::Keys& keys_;
  std::vector<Shape> slots_ = std::vector<Shape>(kSlots);  // by the key list's hash
};

}  // namespace tarn
