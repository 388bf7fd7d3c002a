// SPDX-License-Identifier: Apache-2.0
// Notation: how an expected value is set against one that was found, and how one that was found is written down as
// expected. Values must be equal, members that aren't expected included, but for texts of the form "<...>", which stand
// for what differs from run to run:
//
//   "<now>"           a moment of the playing, in epoch seconds
//   "<number>"        a number from 0 on
//   "<whole>"         a whole number from 0 on; "<whole from 2>" one from 2 on
//   "<text>"          a text that isn't empty
//   "<a|b|c>"         one of these: a text, or the JSON spelling of another value
//   "<session 1>"     the number of a session, the same wherever this stands
//   "<any>"           anything
//   "<=<ff>>"         the text "<ff>", which looks like one of these
//   "<text of ...>"   a text that spells such a value
//
// In a text with commas each part between them may be one of these: "4102444810,<now>,<now>".
#pragma once

#include <nlohmann/json.hpp>
#include <string>

namespace tarn::scenario {

using nlohmann::json;

// When the scripts were played, in epoch seconds.
struct Playing {
  double startedAt = 0;
  double endedAt = 0;

  // With some slack, since clocks are read at several places.
  bool contains(double epochSeconds) const {
    constexpr double kSlackSeconds = 1;
    return epochSeconds >= startedAt - kSlackSeconds && epochSeconds <= endedAt + kSlackSeconds;
  }
};

// How `found` differs from what is expected, with the path of the member; empty when it doesn't.
std::string differenceOf(const std::string& path, const json& expected, const json& found, const Playing& playing);
// `found` as an expectation: what is known to differ from run to run in the notation above. But for session numbers,
// which the writer numbers again.
json asExpectation(const json& found, const Playing& playing);
// Throws std::runtime_error for a text of the form "<...>" that means nothing.
void checkNotation(const json& expected);

}  // namespace tarn::scenario
