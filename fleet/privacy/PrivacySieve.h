// SPDX-License-Identifier: Apache-2.0
// PrivacySieve: lets through what the rules allow and hashes what identifies, before anything is written or sent.
//
// What it found out about a kind of event or a key is remembered, since the same ones come again and again. Threads:
// one at a time.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "fleet/privacy/FleetKey.h"
#include "fleet/privacy/Rules.h"

namespace tarn::fleet {

class PrivacySieve {
 public:
  // For this epoch's hashes.
  PrivacySieve(Rules rules, const FleetKey& key) : rules_(std::move(rules)), key_(key) {}

  const Rules& rules() const noexcept { return rules_; }
  // From here on hashes are those of this moment, in epoch seconds.
  void setTime(double seconds);

  // Whether events of this kind may leave. An event of analytics named sys.oxbow.tarnkit.CATEGORY.TYPE is a message
  // of that category and type; any other one, the same message's second name too, goes by back-end and name.
  bool allowsKind(std::string_view backend, std::string_view name) const;
  // Whether the session is in the sample; `run` and `session` are its numbers, 0 for nobody's events.
  bool allowsSession(std::string_view device, std::string_view boot, std::int64_t run, std::int64_t session) const;
  // Appends the object with what may leave of it. False, and nothing, where the text isn't one object.
  [[nodiscard]] bool appendObject(std::string& out, std::string_view json);
  // What may leave of a text by this key; empty: nothing.
  std::string textOf(std::string_view key, std::string_view text);

 private:
  enum class Verdict : std::uint8_t { Stays, Leaves, Hashed };
  struct TextHash {
    using is_transparent = void;
    std::size_t operator()(std::string_view text) const noexcept { return std::hash<std::string_view>()(text); }
  };
  template <class Value>
  using ByText = std::unordered_map<std::string, Value, TextHash, std::equal_to<>>;

  Verdict verdictOf(std::string_view key);
  // Of a value as it stands in JSON.
  const std::string& hashOf(std::string_view value);

  Rules rules_;
  const FleetKey key_;
  std::int64_t epoch_ = 0;
  ByText<Verdict> verdicts_;
  ByText<std::string> hashes_;  // of this epoch
};

}  // namespace tarn::fleet
