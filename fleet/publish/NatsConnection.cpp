// SPDX-License-Identifier: Apache-2.0
#include "fleet/publish/NatsConnection.h"

#include <algorithm>
#include <string_view>
#include <utility>
#include <vector>

namespace tarn::fleet {

namespace {

constexpr std::int64_t kConnectMilliseconds = 3000;
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

// The library's own words, without the place in its source that it puts before them.
std::string reasonIn(std::string_view text) {
  const std::size_t place = text.starts_with('(') ? text.find("): ") : std::string_view::npos;
  text.remove_prefix(place == std::string_view::npos ? 0 : place + 3);
  // A server that doesn't accept a certificate closes the connection without a word.
  if (text == "Expected 'PONG', got ''") {
    return "the server hung up on the greeting; its log tells why (a certificate that it misses or that expired?)";
  }
  return std::string(text);
}

natsStatus setPace(natsOptions* options, const std::string& name) {
  const natsStatus results[] = {
      natsOptions_SetName(options, name.c_str()),
      natsOptions_SetTimeout(options, kConnectMilliseconds),
      natsOptions_SetPingInterval(options, kPingMilliseconds),
      natsOptions_SetMaxPingsOut(options, kMostPings),
  };
  for (const natsStatus status : results) {
    if (status != NATS_OK) return status;
  }
  return NATS_OK;
}

natsStatus setToGoOn(natsOptions* options) {
  const natsStatus results[] = {
      natsOptions_SetMaxReconnect(options, -1),
      natsOptions_SetReconnectWait(options, kReconnectMilliseconds),
      natsOptions_SetReconnectJitter(options, kJitterMilliseconds, kJitterMilliseconds),
      natsOptions_SetReconnectBufSize(options, kReconnectBytes),
      // Its own callback, as it would wait for the first connection otherwise.
      natsOptions_SetRetryOnFailedConnect(options, true, connected, nullptr),
  };
  for (const natsStatus status : results) {
    if (status != NATS_OK) return status;
  }
  return NATS_OK;
}

Result<NatsOwned<natsOptions>> makeOptions(const ServerSettings& settings, const std::string& name) {
  natsOptions* made = nullptr;
  if (const natsStatus status = natsOptions_Create(&made); status != NATS_OK) return {{}, natsError("NATS", status)};
  NatsOwned<natsOptions> options(made);
  if (const natsStatus status = setServers(made, settings.urls); status != NATS_OK) {
    return {{}, natsError(settings.urls, status)};
  }
  if (const natsStatus status = setPace(made, name); status != NATS_OK) return {{}, natsError("NATS", status)};
  if (Status set = setSecrets(made, settings); set.failed()) return {{}, std::move(set)};
  return {std::move(options), {}};
}

}  // namespace

Error natsError(const std::string& what, natsStatus status) {
  return {status, what + ": " + natsStatus_GetText(status)};
}

Status checkNatsSettings(const ServerSettings& settings) {
  return makeOptions(settings, "check").error;
}

Result<NatsOwned<natsConnection>> connectToNats(const ServerSettings& settings, const std::string& name) {
  const Result<NatsOwned<natsOptions>> options = makeOptions(settings, name);
  if (options.failed()) return {{}, options.error};
  if (const natsStatus status = setToGoOn(options.value.get()); status != NATS_OK) {
    return {{}, natsError("NATS", status)};
  }
  natsConnection* connection = nullptr;
  const natsStatus status = natsConnection_Connect(&connection, options.value.get());
  if (status != NATS_OK && status != NATS_NOT_YET_CONNECTED) return {{}, natsError(settings.urls, status)};
  return {NatsOwned<natsConnection>(connection), {}};
}

Result<NatsOwned<natsConnection>> connectToNatsOnce(const ServerSettings& settings, const std::string& name) {
  const Result<NatsOwned<natsOptions>> options = makeOptions(settings, name);
  if (options.failed()) return {{}, options.error};
  if (const natsStatus status = natsOptions_SetAllowReconnect(options.value.get(), false); status != NATS_OK) {
    return {{}, natsError("NATS", status)};
  }
  natsConnection* connection = nullptr;
  const natsStatus status = natsConnection_Connect(&connection, options.value.get());
  if (status == NATS_OK) return {NatsOwned<natsConnection>(connection), {}};
  const char* const text = nats_GetLastError(nullptr);
  const std::string why = text != nullptr ? reasonIn(text) : "";
  if (why.empty()) return {{}, natsError(settings.urls, status)};
  return {{}, Error{status, settings.urls + ": " + why}};
}

}  // namespace tarn::fleet
