// SPDX-License-Identifier: Apache-2.0
// The rules of combining and of the three walks, written the long way round: whole payloads as maps, every value of
// every moment worked out by itself. To compare with.
#pragma once

#include <map>
#include <string>
#include <vector>

#include "plist/Value.h"

namespace tarn::testing {

using ModelPayload = std::map<std::string, plist::Value>;
using ModelPayloads = std::vector<ModelPayload>;

// What combining leaves: the places of the messages that are left; `messages` become what they are afterwards.
std::vector<std::size_t> combineModel(ModelPayloads& messages, const std::vector<std::string>& keys, double pause);

// The derived payloads. `messages` become what combining makes of them.
ModelPayloads volumeModel(ModelPayloads& messages, const ModelPayload& previous, const std::string& process);
ModelPayloads inputModel(ModelPayloads& messages, const ModelPayload& previous, const std::string& process);
ModelPayloads lagoonModel(const ModelPayloads& messages, const ModelPayload& previous);

}  // namespace tarn::testing
