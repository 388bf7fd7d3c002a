// Vocabulary: the scenario's own tables of what numbers and names mean. Written down once more here, apart from the
// service's, so that a mistake in the service's tables shows as a difference.
#pragma once

#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>

namespace tarn::scenario {

// A category, type or service type of a script line, by number or name. Throws std::runtime_error for anything else.
std::uint32_t categoryOf(const nlohmann::json& value);
std::uint16_t typeOf(const nlohmann::json& value);
std::uint16_t serviceTypeOf(const nlohmann::json& value);

// How event names and tags spell them.
std::string categoryText(std::uint32_t category);
std::string typeText(std::uint16_t type);
std::string serviceText(std::uint16_t serviceType);

}  // namespace tarn::scenario
