// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/Probes.h"

#include <nlohmann/json.hpp>
#include <optional>
#include <utility>

namespace tarn::trace_analysis {

namespace {

using Json = nlohmann::json;

constexpr std::size_t kMostDescriptionBytes = std::size_t{4} << 20U;

class Reader {
 public:
  Reader(const ChromeTrace& trace, const ProbeLimits& limits) : trace_(trace), limits_(limits) {}

  // The probes of those descriptions that ask for one.
  std::vector<Probe> probesOf(const Json& descriptions, std::size_t depth) {
    std::vector<Probe> probes;
    if (depth > limits_.mostDepth) {
      failure_ = Error{0, "probes nest more than " + std::to_string(limits_.mostDepth) + " deep"};
      return probes;
    }
    for (const Json& description : descriptions) {
      if (failure_.failed()) break;
      if (auto probe = probeOf(description, depth)) {
        probes.push_back(std::move(*probe));
      }
    }
    return probes;
  }
  const Status& failure() const { return failure_; }

 private:
  // A text under the key; `fallback` when it isn't there, nothing when something else is.
  static std::optional<std::string> textAt(const Json& description, const char* key, std::string_view fallback) {
    const auto found = description.find(key);
    if (found == description.end()) return std::string(fallback);
    return found->is_string() ? std::optional(found->get<std::string>()) : std::nullopt;
  }

  std::optional<Probe> probeOf(const Json& description, std::size_t depth) {
    if (!description.is_object()) return std::nullopt;
    const bool namesSignposts = description.contains("signpost");
    const auto name = textAt(description, "name", "");
    const auto kind = textAt(description, "type", namesSignposts ? "SkeinSignpostIntervalProbe" : "SkeinProbe");
    const auto subsystem = textAt(description, "subsystem", "*");
    const auto signpost = textAt(description, "signpost", "*");
    const auto children = description.find("children");
    const bool childrenAreWrong = children != description.end() && !children->is_array();
    if (!name || name->empty() || !kind || !subsystem || !signpost || childrenAreWrong) return std::nullopt;
    if (*kind != "SkeinSignpostIntervalProbe" && *kind != "SkeinProbe") return std::nullopt;
    if (++probes_ > limits_.mostProbes) {
      failure_ = Error{0, "there are more than " + std::to_string(limits_.mostProbes) + " probes"};
      return std::nullopt;
    }
    Probe probe{*name, *kind == "SkeinSignpostIntervalProbe", {}, {}};
    if (probe.measuresIntervals) {
      probe.events = eventsOf(*subsystem, *signpost);
    }
    if (children != description.end()) {
      probe.children = probesOf(*children, depth + 1);
    }
    return probe;
  }

  // Each text of the trace is looked at once, however many intervals bear it.
  std::vector<bool> matchesOf(std::string_view pattern) const {
    std::vector<bool> matches;
    matches.reserve(trace_.texts.size());
    for (const std::string& text : trace_.texts) {
      matches.push_back(matchesPattern(pattern, text));
    }
    return matches;
  }

  std::vector<std::uint32_t> eventsOf(std::string_view subsystem, std::string_view signpost) {
    const std::vector<bool> subsystems = matchesOf(subsystem);
    const std::vector<bool> names = matchesOf(signpost);
    std::vector<std::uint32_t> events;
    for (std::size_t i = 0; i < trace_.intervals.size(); ++i) {
      const Interval& interval = trace_.intervals[i];
      if (!subsystems[interval.subsystem] || !names[interval.name]) continue;
      if (++events_ > limits_.mostEvents) {
        failure_ = Error{0, "the probes have more than " + std::to_string(limits_.mostEvents) + " events"};
        return {};
      }
      events.push_back(static_cast<std::uint32_t>(i));
    }
    return events;
  }

  const ChromeTrace& trace_;
  const ProbeLimits limits_;
  std::size_t probes_ = 0;
  std::size_t events_ = 0;
  Status failure_;
};

}  // namespace

Result<std::vector<Probe>> probesFor(std::string_view descriptions, const ChromeTrace& trace,
                                     const ProbeLimits& limits) {
  if (descriptions.size() > kMostDescriptionBytes) return {{}, Error{0, "the descriptions are too large"}};
  const Json parsed = Json::parse(descriptions, nullptr, false);
  if (!parsed.is_array()) return {{}, Error{0, "the descriptions are no JSON array"}};
  Reader reader(trace, limits);
  Result<std::vector<Probe>> read{reader.probesOf(parsed, 1), reader.failure()};
  if (read.failed()) {
    read.value.clear();
  }
  return read;
}

bool matchesPattern(std::string_view pattern, std::string_view text) noexcept {
  std::size_t at = 0;
  std::size_t star = std::string_view::npos;  // the last "*" that was met
  std::size_t resume = 0;                     // where the text after its run begins
  std::size_t i = 0;
  while (i < text.size()) {
    if (at < pattern.size() && pattern[at] == '*') {
      star = at++;
      resume = i;
    } else if (at < pattern.size() && (pattern[at] == '?' || pattern[at] == text[i])) {
      ++at;
      ++i;
    } else if (star != std::string_view::npos) {
      at = star + 1;
      i = ++resume;
    } else {
      return false;
    }
  }
  while (at < pattern.size() && pattern[at] == '*') {
    ++at;
  }
  return at == pattern.size();
}

}  // namespace tarn::trace_analysis
