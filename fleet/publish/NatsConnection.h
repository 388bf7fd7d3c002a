// SPDX-License-Identifier: Apache-2.0
// NatsConnection: a connection to NATS servers by these settings, for publishing and for pulling. Threads: the
// library's calls are for any.
#pragma once

#include <nats/nats.h>

#include <memory>
#include <string>

#include "fleet/publish/ServerSettings.h"
#include "plist/Result.h"

namespace tarn::fleet {

struct NatsDeleter {
  void operator()(natsOptions* options) const { natsOptions_Destroy(options); }
  void operator()(natsConnection* connection) const { natsConnection_Destroy(connection); }
  void operator()(jsCtx* context) const { jsCtx_Destroy(context); }
  void operator()(natsSubscription* subscription) const { natsSubscription_Destroy(subscription); }
  void operator()(natsMsg* message) const { natsMsg_Destroy(message); }
};
template <class Object>
using NatsOwned = std::unique_ptr<Object, NatsDeleter>;

// "what: why", by the library's words.
Error natsError(const std::string& what, natsStatus status);

// Whether files that the settings name can be used.
[[nodiscard]] Status checkNatsSettings(const ServerSettings& settings);
// Begins to connect and doesn't wait for it; goes on for ever. The error is one of the settings.
Result<NatsOwned<natsConnection>> connectToNats(const ServerSettings& settings, const std::string& name);
// One try, for a few seconds at most for each server; a connection that is lost stays lost. The error says why, as far
// as the library knows.
Result<NatsOwned<natsConnection>> connectToNatsOnce(const ServerSettings& settings, const std::string& name);

}  // namespace tarn::fleet
