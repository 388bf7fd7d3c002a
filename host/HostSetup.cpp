#include "host/HostSetup.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <utility>

#include "host/log/LogTarget.h"
#include "host/settings/StateFolder.h"

namespace tarn::linux_host {

namespace {

// A log whose reader is stuck must not hold up the end.
constexpr std::chrono::milliseconds kLastWhileOfTheLog{500};

// The listening socket: the one handed over, else the right to the one named.
ListenSocket::Result openSocket(const ServiceOptions& options) {
  ListenSocket::Result handedOver = ListenSocket::takeHandedOver();
  if (handedOver.socket || !handedOver.error.empty()) {
    return handedOver;
  }
  if (!options.socketPath) {
    handedOver.error = "no socket: none was handed over, and neither --socket nor XDG_RUNTIME_DIR names one";
    return handedOver;
  }
  if (options.socketIsDefault) {
    makeFolder(options.socketPath->substr(0, options.socketPath->rfind('/')), 0750);  // binding tells when it failed
  }
  return ListenSocket::claim(*options.socketPath);
}

// Also when it only can't be told: reading it says what is wrong.
bool isThere(const std::string& path) {
  return !path.empty() && (::access(path.c_str(), F_OK) == 0 || (errno != ENOENT && errno != ENOTDIR));
}

}  // namespace

std::optional<Refusal> HostSetup::prepare(const ServiceOptions& options) {
  // Whatever a caller's mask lets through: what the service makes is for its user and group alone.
  ::umask(::umask(0) | S_IWGRP | S_IRWXO);
  if (auto refusal = readSettings(options)) {
    return refusal;
  }
  if (std::string error = prepareStateDirectory(options.stateDirectory); !error.empty()) {
    return Refusal{std::move(error)};
  }
  signals = std::make_shared<SignalSource>();
  ListenSocket::Result opened = openSocket(options);
  if (!opened.socket) {
    return Refusal{std::move(opened.error)};
  }
  socket = std::move(opened.socket);
  if (std::string error = holdStateDirectory(options.stateDirectory, stateLock_); !error.empty()) {
    return Refusal{std::move(error)};
  }
  auto opening = openLog(options.logTarget, options.logLevel, clock);
  if (opening.failed()) {
    return Refusal{std::move(opening.error->text)};
  }
  queuedLog_ = std::move(opening.value);
  log = std::make_unique<LogFloodGuard>(*queuedLog_, clock);
  return std::nullopt;
}

void HostSetup::settleLog() {
  log->tellCounts();
  static_cast<void>(queuedLog_->settle(kLastWhileOfTheLog));
}

std::optional<Refusal> HostSetup::readSettings(const ServiceOptions& options) {
  // One that is named must be there; the installed one may be absent.
  if (const auto& file = options.configurationFile; file || isThere(options.defaultConfigurationFile)) {
    ReadConfiguration read = readConfiguration(file.value_or(options.defaultConfigurationFile));
    if (!read.configuration) {
      return Refusal{std::move(read.error), kExitConfiguration};
    }
    configuration = std::move(*read.configuration);
  }
  if (options.devicePropertiesFile) {
    if (std::string error = deviceProperties.load(*options.devicePropertiesFile); !error.empty()) {
      return Refusal{std::move(error), kExitConfiguration};
    }
  }
  return std::nullopt;
}

}  // namespace tarn::linux_host
