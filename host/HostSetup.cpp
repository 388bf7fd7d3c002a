// SPDX-License-Identifier: Apache-2.0
#include "host/HostSetup.h"

#include <sys/stat.h>

#include <cerrno>
#include <chrono>
#include <utility>

#include "host/log/JournalOutput.h"
#include "host/log/LogTarget.h"
#include "host/log/PrefixedLog.h"
#include "host/loop/WorkOwner.h"
#include "host/settings/StateDirectory.h"
#include "host/system/Files.h"
#include "platform/LogCondition.h"

namespace tarn::linux_host {

namespace {

// A log whose reader is stuck must not hold up the end.
constexpr std::chrono::milliseconds kLastWhileOfTheLog{500};

// The right to the ordinary socket that is named.
Result<ListenSocket> claimSocket(const ServiceOptions& options) {
  if (!options.socketPath) {
    return {{}, Error{0, "no socket: none was handed over, and neither --socket nor XDG_RUNTIME_DIR names one"}};
  }
  if (options.socketIsDefault) {
    const std::string folder = options.socketPath->substr(0, options.socketPath->rfind('/'));
    static_cast<void>(createDirectories(folder, 0750));  // binding tells when it failed
  }
  return ListenSocket::claim(*options.socketPath);
}

// The right to the admin socket; nothing when none is wanted.
Result<ListenSocket> claimAdminSocket(const ServiceOptions& options, const ListenSocket& ordinary, bool isWanted) {
  if (options.adminSocketPath) return ListenSocket::claim(*options.adminSocketPath);
  if (!isWanted) return {};
  const std::string path = ordinary.path();
  if (path.empty()) return {{}, Error{0, "no admin socket: none was handed over, and --admin-socket names none"}};
  return ListenSocket::claim(adminSocketPath(path));
}

// The listening sockets: those handed over, else the right to those named.
Result<ListenSockets> openSockets(const ServiceOptions& options, bool separateAdmin) {
  Result<ListenSockets> opened = ListenSocket::takeHandedOver();
  ListenSockets& sockets = opened.value;
  if (opened.ok() && !sockets.ordinary) {
    Result<ListenSocket> claimed = claimSocket(options);
    sockets.ordinary = std::move(claimed.value);
    opened.error = std::move(claimed.error);
  }
  if (opened.ok() && !sockets.admin) {
    Result<ListenSocket> claimed = claimAdminSocket(options, sockets.ordinary, separateAdmin);
    sockets.admin = std::move(claimed.value);
    opened.error = std::move(claimed.error);
  }
  return opened;
}

// The line on stderr, which there is too, has no identifier in the journal. Without a journal it is enough.
void tellJournal(const platform::Clock& clock, const Error& wrong) {
  JournalOutput journal;
  if (journal.open().failed()) return;
  const platform::LogConditionScope condition(platform::LogCondition::ConfigurationRefused);
  constexpr int kLine = __LINE__;
  const std::string text = prefixed("HostSetup", wrong.text, kLine);
  static_cast<void>(journal.write(
      journal.formed(clock.epochSeconds(), {kHostCategory, platform::LogLevel::Error, "HostSetup", kLine, text})));
}

}  // namespace

Status HostSetup::prepare(const ServiceOptions& options) {
  // Whatever a caller's mask lets through: what the service makes is for its user and group alone.
  ::umask(::umask(0) | S_IWGRP | S_IRWXO);
  options_ = options;
  if (const Status read = readSettings(); read.failed()) {
    if (options.logTarget == "journal") {
      tellJournal(clock, *read);
    }
    return Error{kExitConfiguration, read->text};
  }
  if (const Status prepared = prepareStateDirectory(options.stateDirectory); prepared.failed()) {
    return Error{kExitFailure, prepared->text};
  }
  signals = std::make_shared<SignalSource>();
  Result<ListenSockets> opened = openSockets(options, configuration.access.separateAdmin);
  if (opened.failed()) return Error{kExitFailure, opened.error->text};
  sockets = std::move(opened.value);
  if (const Status held = holdStateDirectory(options.stateDirectory, stateLock_); held.failed()) {
    return Error{kExitFailure, held->text};
  }
  Result<std::unique_ptr<QueuedLog>> opening =
      openLog(options.logTarget, configuration.logLevel, clock, JournalOutput::kSocket,
              [this] { return sessionIds.of(WorkOwner::current()); });
  if (opening.failed()) return Error{kExitFailure, opening.error->text};
  queuedLog_ = std::move(opening.value);
  log = std::make_unique<LogFloodGuard>(*queuedLog_, clock);
  return {};
}

void HostSetup::settleLog() {
  log->tellCounts();
  static_cast<void>(queuedLog_->settle(kLastWhileOfTheLog));
}

void HostSetup::setLogLevel(platform::LogLevel level) noexcept {
  queuedLog_->setLevel(level);
  log->setLevel(level);
}

Result<HostConfiguration> HostSetup::readConfiguration() const {
  // One that is named must be there; the installed one may be absent.
  const auto& named = options_.configurationFile;
  Result<HostConfiguration> read;
  if (const std::string& file = named ? *named : options_.defaultConfigurationFile; !file.empty()) {
    read = readConfigurationWithDropIns(file, !named);
  }
  read.value.logLevel = options_.logLevel.value_or(read.value.logLevel);
  return read;
}

Status HostSetup::readSettings() {
  Result<HostConfiguration> read = readConfiguration();
  if (read.failed()) return std::move(read.error);
  configuration = std::move(read.value);
  if (options_.devicePropertiesFile) return deviceProperties.load(*options_.devicePropertiesFile);
  if (options_.defaultDevicePropertiesFile.empty()) return {};
  Status loaded = deviceProperties.load(options_.defaultDevicePropertiesFile);
  const bool isAbsent = loaded.failed() && (loaded->code == ENOENT || loaded->code == ENOTDIR);
  return isAbsent ? Status() : std::move(loaded);
}

}  // namespace tarn::linux_host
