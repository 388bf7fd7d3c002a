// SPDX-License-Identifier: Apache-2.0
// NatsConnection: a connection to NATS servers by these settings, for publishing and for pulling: it goes on trying for
// ever. Threads: the library's calls are for any.
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

// Begins to connect and doesn't wait for it. The error is one of the settings.
Result<NatsOwned<natsConnection>> connectToNats(const ServerSettings& settings, const std::string& name);

}  // namespace tarn::fleet
