// SPDX-License-Identifier: Apache-2.0
// SimilarNames: whether one name is likely another one, mistyped or with another unit.
//
// Stateless. Threads: any.
#pragma once

#include <string>
#include <string_view>

namespace tarn::ctl {

// The name in lower case, letters and digits alone.
std::string folded(std::string_view name);

// Whether the two differ in case and punctuation alone, or in one letter (two in a long name): put in, left out,
// replaced, or two that changed places. Names of fewer than five letters and digits are similar only when these are the
// same: one letter would make any of them another. Long is ten and more.
bool areSimilar(std::string_view one, std::string_view other);

// The name without a unit at its end: "session_duration" of "session_duration_ms"; the name itself when it has none. It
// looks into the name.
std::string_view withoutUnit(std::string_view name);

}  // namespace tarn::ctl
