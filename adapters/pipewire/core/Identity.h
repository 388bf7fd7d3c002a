// SPDX-License-Identifier: Apache-2.0
// Who a stream belongs to: the application, and what a session's configuration tells of it.
#pragma once

#include <string>

#include "adapters/pipewire/core/GraphFacts.h"
#include "adapters/pipewire/core/Rules.h"
#include "adapters/pipewire/core/StreamActions.h"

namespace tarn::streams {

// application.id, else application.process.binary, else node.name; each of the node's own properties, else of its
// client's. "Unknown" when nobody tells.
std::string applicationOf(const Properties& node, const Properties& client);
// The session of a stream with these properties. `client` is empty when the stream has none.
BeginSession sessionOf(StreamNumber stream, const Properties& node, const Properties& client, const Rules& rules);

// A text that names a device by its hardware address, with a short number in its place that is the same each time:
// a Bluetooth address tells who somebody is.
std::string withoutAddress(std::string_view name);

}  // namespace tarn::streams
