// SPDX-License-Identifier: Apache-2.0
// RecorderTallyService: the analytics-event service as the recorder stands in for it. The configuration says which
// names are in use; what is handed over is recorded under back-end "tally".
//
// Owner: the platform. Threads: the server queue.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/Clock.h"
#include "platform/TallyService.h"

namespace tarn::recorder {

class Recorder;

class RecorderTallyService : public platform::TallyService {
 public:
  // Names whose answers are remembered; when there are more, all are forgotten and asked for again. Names come from
  // clients, so there may be any number.
  static constexpr std::size_t kRememberedNames = 4096;
  // Longer names, in bytes, are never remembered: with the bound above that is a megabyte of names at the most.
  static constexpr std::size_t kLongestRememberedName = 256;

  // `inUse`: patterns of the wanted names (see globMatches). The recorder and the clock outlive this.
  RecorderTallyService(Recorder& recorder, const platform::Clock& clock, std::vector<std::string> inUse);

  // Other patterns from now on.
  void setInUse(std::vector<std::string> inUse);
  // Whether a pattern matches the whole name. The patterns are asked once for each name that is remembered; with "*"
  // among them, or with none, nothing is looked up.
  bool eventIsInUse(std::string_view name) override;
  // The payload is asked for here and now, so that the recorder holds it as it is at hand-over. Whether the name is in
  // use isn't asked again.
  void sendEventLazy(std::string_view name, PayloadCallback payload) override;

 private:
  // So that a look-up of a name that is no string of its own makes none.
  struct NameHash {
    using is_transparent = void;
    std::size_t operator()(std::string_view name) const noexcept { return std::hash<std::string_view>()(name); }
  };

  // Takes time with the number of patterns.
  bool matchesAny(std::string_view name) const noexcept;

  Recorder& recorder_;
  const platform::Clock& clock_;
  // As the configuration has them.
  std::vector<std::string> inUse_;
  bool all_ = false;  // one of the patterns is "*"
  // Name, and whether it is in use. Of the server queue alone, so without a lock.
  std::unordered_map<std::string, bool, NameHash, std::equal_to<>> remembered_;
};

}  // namespace tarn::recorder
