// SPDX-License-Identifier: Apache-2.0
#include "fleet/privacy/PrivacySieve.h"

#include <algorithm>

#include "fleet/privacy/JsonMembers.h"
#include "recorder/store/GlobPattern.h"

namespace tarn::fleet {

namespace {

constexpr std::string_view kMessages = "sys.oxbow.tarnkit.";
// Clients make up keys and values: what is remembered of them is bounded.
constexpr std::size_t kMostRemembered = 4096;

bool anyMatches(const std::vector<std::string>& patterns, std::string_view text) {
  return std::any_of(patterns.begin(), patterns.end(),
                     [text](const std::string& pattern) { return recorder::globMatches(pattern, text); });
}

template <class Map>
void keepBounded(Map& map) {
  if (map.size() >= kMostRemembered) {
    map.clear();
  }
}

}  // namespace

void PrivacySieve::setTime(double seconds) {
  const std::int64_t epoch = epochAt(seconds, rules_.rotateDays);
  if (epoch != epoch_) {
    epoch_ = epoch;
    hashes_.clear();
  }
}

bool PrivacySieve::allowsKind(std::string_view backend, std::string_view name) const {
  if (backend == "tally" && name.substr(0, kMessages.size()) == kMessages) {
    const std::string_view kind = name.substr(kMessages.size());
    const std::size_t dot = kind.rfind('.');
    if (dot != std::string_view::npos) {
      return anyMatches(rules_.categories, kind.substr(0, dot)) && anyMatches(rules_.types, kind.substr(dot + 1));
    }
  }
  return anyMatches(rules_.others, std::string(backend) + "/" + std::string(name));
}

bool PrivacySieve::allowsSession(std::string_view device, std::string_view boot, std::int64_t run,
                                 std::int64_t session) const {
  if (rules_.sample >= 1) return true;
  std::string which(device);
  which.append(boot).append("/").append(std::to_string(run)).append("/").append(std::to_string(session));
  return key_.isInSample(rules_.sample, which);
}

PrivacySieve::Verdict PrivacySieve::verdictOf(std::string_view key) {
  if (const auto known = verdicts_.find(key); known != verdicts_.end()) return known->second;
  keepBounded(verdicts_);
  const Verdict verdict = anyMatches(rules_.hashed, key) ? Verdict::Hashed
                          : anyMatches(rules_.keys, key) ? Verdict::Leaves
                                                         : Verdict::Stays;
  verdicts_.emplace(key, verdict);
  return verdict;
}

const std::string& PrivacySieve::hashOf(std::string_view value) {
  if (const auto known = hashes_.find(value); known != hashes_.end()) return known->second;
  keepBounded(hashes_);
  return hashes_.emplace(value, key_.hashOf(epoch_, value)).first->second;
}

bool PrivacySieve::appendObject(std::string& out, std::string_view json) {
  const std::size_t begin = out.size();
  out += '{';
  JsonMembers members(json);
  while (members.next()) {
    const Verdict verdict = verdictOf(members.key());
    if (verdict == Verdict::Stays) continue;
    if (out.size() > begin + 1) {
      out += ',';
    }
    out.append("\"").append(members.key()).append("\":");
    std::string_view value = members.value();
    if (verdict == Verdict::Leaves) {
      out += value;
      continue;
    }
    // A text's hash is that of what it says, as where it isn't in JSON.
    if (value.front() == '"') {
      value = value.substr(1, value.size() - 2);
    }
    out.append("\"").append(hashOf(value)).append("\"");
  }
  if (members.failed()) {
    out.resize(begin);
    return false;
  }
  out += '}';
  return true;
}

std::string PrivacySieve::textOf(std::string_view key, std::string_view text) {
  if (text.empty()) return {};
  switch (verdictOf(key)) {
    case Verdict::Leaves:
      return std::string(text);
    case Verdict::Hashed:
      return hashOf(text);
    case Verdict::Stays:
      break;
  }
  return {};
}

}  // namespace tarn::fleet
