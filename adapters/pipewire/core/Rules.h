// SPDX-License-Identifier: Apache-2.0
// What the configuration decides: who is reported, as what, and what is never told.
//
// Made once, before PipeWire is looked at; its defaults are those of the manual. Threads: any, it never changes.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tarn::streams {

// Whether a text is what a pattern means: * stands for any text, ? for any one character, all else for itself.
bool matchesGlob(std::string_view pattern, std::string_view text);

// The number of a service type's name, as in "telephony"; nothing for a name that is none.
std::optional<std::uint16_t> serviceTypeNamed(std::string_view name);
// The other way; "unknown" for a number that is none.
std::string_view serviceTypeName(std::uint16_t number);

struct Rules {
  // A media.role, as PipeWire spells it, and the service type of its streams.
  using RoleTable = std::map<std::string, std::uint16_t, std::less<>>;

  bool off = false;                     // nothing is reported at all
  bool mediaNames = false;              // titles are told
  bool profiler = true;                 // xruns and the graph's quantum are asked for
  std::vector<std::string> allow{"*"};  // applications, as patterns
  std::vector<std::string> deny;        // likewise; it goes before `allow`
  RoleTable roles = defaultRoles();
  RoleTable types;                // of applications, as patterns, for streams whose role is missing or in no row
  std::uint16_t withoutRole = 0;  // generic: the other ones

  static RoleTable defaultRoles();
  bool mayReport(std::string_view application) const;
  std::uint16_t serviceTypeOf(std::string_view role, std::string_view application) const;
};

}  // namespace tarn::streams
