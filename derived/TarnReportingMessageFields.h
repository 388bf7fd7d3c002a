// TarnReportingMessageFields: the few values of a payload that a walk over a session's messages looks at, read once a
// message, or the running state that such messages are laid over one after the other.
//
// `Field` is an enumeration that numbers the values from 0, with `Count` behind the last. The values lie in the payload
// (or wherever they were set from), which must stay as it is meanwhile. A payload is never copied: a state of all its
// keys, merged for every message, would cost more than everything else at a session's stop.
//
// Threads: the server queue.
#pragma once

#include <array>
#include <cstddef>

#include "plist/Key.h"
#include "plist/ValueView.h"

namespace tarn {

template <class Field>
class TarnReportingMessageFields {
 public:
  static constexpr std::size_t kCount = static_cast<std::size_t>(Field::Count);
  using Keys = std::array<plist::Key, kCount>;

  TarnReportingMessageFields() = default;
  // `source`: a payload, or whatever else has values under keys.
  template <class Source>
  TarnReportingMessageFields(const Keys& keys, const Source& source) noexcept {
    for (std::size_t i = 0; i < kCount; ++i) {
      values_[i] = source.get(keys[i]);
    }
  }

  // Absent when the payload doesn't hold it.
  const plist::ValueView& operator[](Field field) const noexcept { return values_[static_cast<std::size_t>(field)]; }
  plist::ValueView& operator[](Field field) noexcept { return values_[static_cast<std::size_t>(field)]; }

  // Takes over every value that the later payload holds.
  void merge(const TarnReportingMessageFields& later) noexcept {
    for (std::size_t i = 0; i < kCount; ++i) {
      if (later.values_[i].present()) {
        values_[i] = later.values_[i];
      }
    }
  }

 private:
  std::array<plist::ValueView, kCount> values_;
};

}  // namespace tarn
