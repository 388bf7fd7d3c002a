// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/NatsConnection.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace tarn::fleet {

namespace {

constexpr std::int64_t kConnectMilliseconds = 5000;
constexpr std::int64_t kReconnectMilliseconds = 2000;
constexpr std::int64_t kJitterMilliseconds = 1000;
constexpr std::int64_t kPingMilliseconds = 10'000;
constexpr int kMostPings = 2;
// What is written while it isn't connected would be sent later, and again by who was told that it wasn't taken.
constexpr int kReconnectBytes = 64 * 1024;

std::vector<std::string> urlsOf(const std::string& list) {
  std::vector<std::string> urls;
  for (std::size_t begin = 0; begin <= list.size();) {
    const std::size_t end = std::min(list.find(',', begin), list.size());
    if (end > begin) {
      urls.push_back(list.substr(begin, end - begin));
    }
    begin = end + 1;
  }
  return urls;
}

natsStatus setServers(natsOptions* options, const std::string& list) {
  const std::vector<std::string> urls = urlsOf(list);
  std::vector<const char*> texts;
  for (const std::string& url : urls) {
    texts.push_back(url.c_str());
  }
  return natsOptions_SetServers(options, texts.data(), static_cast<int>(texts.size()));
}

Status setSecrets(natsOptions* options, const ServerSettings& settings) {
  if (!settings.authorityFile.empty()) {
    const natsStatus status = natsOptions_LoadCATrustedCertificates(options, settings.authorityFile.c_str());
    if (status != NATS_OK) return natsError(settings.authorityFile, status);
  }
  if (!settings.certificateFile.empty()) {
    const natsStatus status =
        natsOptions_LoadCertificatesChain(options, settings.certificateFile.c_str(), settings.keyFile.c_str());
    if (status != NATS_OK) return natsError(settings.certificateFile, status);
  }
  if (!settings.authorityFile.empty() || !settings.certificateFile.empty()) {
    if (const natsStatus status = natsOptions_SetSecure(options, true); status != NATS_OK) {
      return natsError("TLS", status);
    }
  }
  if (!settings.credentialsFile.empty()) {
    const natsStatus status =
        natsOptions_SetUserCredentialsFromFiles(options, settings.credentialsFile.c_str(), nullptr);
    if (status != NATS_OK) return natsError(settings.credentialsFile, status);
  }
  return {};
}

// Whoever asks looks at the state of the connection.
void connected(natsConnection*, void*) {}

natsStatus setPace(natsOptions* options, const std::string& name) {
  const natsStatus results[] = {
      natsOptions_SetName(options, name.c_str()),
      natsOptions_SetTimeout(options, kConnectMilliseconds),
      natsOptions_SetMaxReconnect(options, -1),
      natsOptions_SetReconnectWait(options, kReconnectMilliseconds),
      natsOptions_SetReconnectJitter(options, kJitterMilliseconds, kJitterMilliseconds),
      natsOptions_SetReconnectBufSize(options, kReconnectBytes),
      natsOptions_SetPingInterval(options, kPingMilliseconds),
      natsOptions_SetMaxPingsOut(options, kMostPings),
      // Its own callback, as it would wait for the first connection otherwise.
      natsOptions_SetRetryOnFailedConnect(options, true, connected, nullptr),
  };
  for (const natsStatus status : results) {
    if (status != NATS_OK) return status;
  }
  return NATS_OK;
}

}  // namespace

Error natsError(const std::string& what, natsStatus status) {
  return {status, what + ": " + natsStatus_GetText(status)};
}

Result<NatsOwned<natsConnection>> connectToNats(const ServerSettings& settings, const std::string& name) {
  natsOptions* made = nullptr;
  if (const natsStatus status = natsOptions_Create(&made); status != NATS_OK) return {{}, natsError("NATS", status)};
  const NatsOwned<natsOptions> options(made);
  if (const natsStatus status = setServers(made, settings.urls); status != NATS_OK) {
    return {{}, natsError(settings.urls, status)};
  }
  if (const natsStatus status = setPace(made, name); status != NATS_OK) return {{}, natsError("NATS", status)};
  if (Status set = setSecrets(made, settings); set.failed()) return {{}, std::move(set)};
  natsConnection* connection = nullptr;
  const natsStatus status = natsConnection_Connect(&connection, made);
  if (status != NATS_OK && status != NATS_NOT_YET_CONNECTED) return {{}, natsError(settings.urls, status)};
  return {NatsOwned<natsConnection>(connection), {}};
}

}  // namespace tarn::fleet
