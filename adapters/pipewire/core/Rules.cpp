// SPDX-License-Identifier: Apache-2.0
#include "adapters/pipewire/core/Rules.h"

#include <algorithm>
#include <array>
#include <utility>

namespace tarn::streams {

namespace {

struct NamedType {
  std::string_view name;
  std::uint16_t number;
};

constexpr std::array<NamedType, 14> kServiceTypes{{{"generic", 0},
                                                   {"wisp", 1},
                                                   {"telephony", 2},
                                                   {"haptics", 3},
                                                   {"alarms", 4},
                                                   {"standalone", 5},
                                                   {"soundautoconfig", 6},
                                                   {"longformaudio", 7},
                                                   {"nonlongformaudio", 8},
                                                   {"audiodeviceusage", 9},
                                                   {"alerts", 10},
                                                   {"test", 11},
                                                   {"apiusage", 12},
                                                   {"systemsounds", 13}}};

bool matchesAny(const std::vector<std::string>& patterns, std::string_view text) {
  return std::any_of(patterns.begin(), patterns.end(),
                     [text](const std::string& pattern) { return matchesGlob(pattern, text); });
}

}  // namespace

bool matchesGlob(std::string_view pattern, std::string_view text) {
  std::size_t at = 0;
  std::size_t in = 0;
  // Where the last star was, and how much of the text it stands for so far.
  std::size_t star = std::string_view::npos;
  std::size_t taken = 0;
  while (in < text.size()) {
    if (at < pattern.size() && pattern[at] == '*') {
      star = at++;
      taken = in;
    } else if (at < pattern.size() && (pattern[at] == '?' || pattern[at] == text[in])) {
      ++at;
      ++in;
    } else if (star != std::string_view::npos) {
      at = star + 1;
      in = ++taken;
    } else {
      return false;
    }
  }
  return pattern.find_first_not_of('*', at) == std::string_view::npos;
}

std::optional<std::uint16_t> serviceTypeNamed(std::string_view name) {
  for (const NamedType& type : kServiceTypes) {
    if (type.name == name) return type.number;
  }
  return std::nullopt;
}

std::string_view serviceTypeName(std::uint16_t number) {
  return number < kServiceTypes.size() ? kServiceTypes[number].name : "unknown";
}

// The roles that PipeWire and the PulseAudio clients on it know.
Rules::RoleTable Rules::defaultRoles() {
  const auto type = [](std::string_view name) { return serviceTypeNamed(name).value_or(0); };
  return {{"Movie", type("longformaudio")},
          {"Music", type("longformaudio")},
          {"Camera", type("nonlongformaudio")},
          {"Screen", type("nonlongformaudio")},
          {"Communication", type("telephony")},
          {"Game", type("nonlongformaudio")},
          {"Notification", type("alerts")},
          {"DSP", type("standalone")},
          {"Production", type("standalone")},
          {"Accessibility", type("systemsounds")},
          {"Test", type("test")}};
}

bool Rules::mayReport(std::string_view application) const {
  return !off && !matchesAny(deny, application) && matchesAny(allow, application);
}

std::uint16_t Rules::serviceTypeOf(std::string_view role, std::string_view application) const {
  if (const auto found = roles.find(role); found != roles.end()) return found->second;
  const auto type = std::find_if(types.begin(), types.end(),
                                 [application](const auto& row) { return matchesGlob(row.first, application); });
  return type == types.end() ? withoutRole : type->second;
}

}  // namespace tarn::streams
