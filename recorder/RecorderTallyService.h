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
  // Names whose answers are remembered; when there are more, all are forgotten and asked for again.
  static constexpr std::size_t kRememberedNames = 4096;
  // Longer names are never remembered.
  static constexpr std::size_t kLongestRememberedName = 256;

  // `inUse`: patterns of the wanted names (see globMatches). The recorder and the clock outlive this.
  RecorderTallyService(Recorder& recorder, const platform::Clock& clock, std::vector<std::string> inUse);

  bool eventIsInUse(std::string_view name) override;
  // The payload is asked for here and now, so that the recorder holds it as it is at hand-over.
  void sendEventLazy(std::string_view name, PayloadCallback payload) override;

 private:
  struct NameHash {
    using is_transparent = void;
    std::size_t operator()(std::string_view name) const noexcept { return std::hash<std::string_view>()(name); }
  };

  bool matchesAny(std::string_view name) const noexcept;

  Recorder& recorder_;
  const platform::Clock& clock_;
  const std::vector<std::string> inUse_;
  const bool all_;  // one of the patterns is "*"
  std::unordered_map<std::string, bool, NameHash, std::equal_to<>> remembered_;
};

}  // namespace tarn::recorder
