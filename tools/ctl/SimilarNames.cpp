// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/SimilarNames.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <numeric>
#include <vector>

namespace tarn::ctl {

namespace {

constexpr std::size_t kShortestMistyped = 5;
constexpr std::size_t kLongName = 10;

constexpr std::array<std::string_view, 18> kUnits{"_s",       "_sec", "_secs", "_seconds", "_ms",      "_msec",
                                                  "_millis",  "_us",  "_ns",   "_minutes", "_percent", "_pct",
                                                  "_decibel", "_db",  "_hz",   "_khz",     "_frames",  "_samples"};

// How many letters have to be put in, left out, replaced or exchanged with their neighbour.
std::size_t distance(std::string_view one, std::string_view other) {
  std::vector<std::size_t> beforeLast(other.size() + 1);
  std::vector<std::size_t> last(other.size() + 1);
  std::vector<std::size_t> row(other.size() + 1);
  std::iota(last.begin(), last.end(), std::size_t{0});
  for (std::size_t i = 1; i <= one.size(); ++i) {
    row[0] = i;
    for (std::size_t j = 1; j <= other.size(); ++j) {
      const std::size_t replaced = last[j - 1] + (one[i - 1] == other[j - 1] ? 0 : 1);
      row[j] = std::min({last[j] + 1, row[j - 1] + 1, replaced});
      if (i > 1 && j > 1 && one[i - 1] == other[j - 2] && one[i - 2] == other[j - 1]) {
        row[j] = std::min(row[j], beforeLast[j - 2] + 1);
      }
    }
    beforeLast = last;
    last = row;
  }
  return last.back();
}

}  // namespace

std::string folded(std::string_view name) {
  std::string text;
  for (const char character : name) {
    const auto byte = static_cast<unsigned char>(character);
    if (std::isalnum(byte) != 0) {
      text += static_cast<char>(std::tolower(byte));
    }
  }
  return text;
}

bool areSimilar(std::string_view one, std::string_view other) {
  const std::string a = folded(one);
  const std::string b = folded(other);
  if (a == b) return true;
  const std::size_t shorter = std::min(a.size(), b.size());
  if (shorter < kShortestMistyped || std::max(a.size(), b.size()) - shorter > 2) return false;
  return distance(a, b) <= (shorter < kLongName ? 1U : 2U);
}

std::string_view withoutUnit(std::string_view name) {
  for (const std::string_view unit : kUnits) {
    if (name.size() > unit.size() && folded(name.substr(name.size() - unit.size() + 1)) == unit.substr(1) &&
        name[name.size() - unit.size()] == '_') {
      return name.substr(0, name.size() - unit.size());
    }
  }
  return name;
}

}  // namespace tarn::ctl
