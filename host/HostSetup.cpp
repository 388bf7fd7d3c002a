#include "host/HostSetup.h"

#include <utility>

#include "host/log/LogTarget.h"
#include "host/settings/StateDirectory.h"
#include "host/system/Files.h"

namespace tarn::linux_host {

namespace {

// The listening socket: the one handed over, else the right to the one named.
Result<ListenSocket> openSocket(const ServiceOptions& options) {
  Result<ListenSocket> handedOver = ListenSocket::takeHandedOver();
  if (handedOver.value || handedOver.failed()) return handedOver;
  if (!options.socketPath) {
    return {{}, Error{0, "no socket: none was handed over, and neither --socket nor XDG_RUNTIME_DIR names one"}};
  }
  if (options.socketIsDefault) {
    const std::string folder = options.socketPath->substr(0, options.socketPath->rfind('/'));
    static_cast<void>(createDirectories(folder, 0755));  // binding tells when it failed
  }
  return ListenSocket::claim(*options.socketPath);
}

}  // namespace

Status HostSetup::prepare(const ServiceOptions& options) {
  if (const Status read = readSettings(options); read.failed()) return Error{kExitConfiguration, read->text};
  if (const Status prepared = prepareStateDirectory(options.stateDirectory); prepared.failed()) {
    return Error{kExitFailure, prepared->text};
  }
  signals = std::make_shared<SignalSource>();
  Result<ListenSocket> opened = openSocket(options);
  if (opened.failed()) return Error{kExitFailure, opened.error->text};
  socket = std::move(opened.value);
  if (const Status held = holdStateDirectory(options.stateDirectory, stateLock_); held.failed()) {
    return Error{kExitFailure, held->text};
  }
  OpenedLog opening = openLog(options.logTarget, options.logLevel, clock);
  log = std::move(opening.log);
  if (!log) return Error{kExitFailure, std::move(opening.error)};
  return {};
}

Status HostSetup::readSettings(const ServiceOptions& options) {
  if (options.configurationFile) {
    Result<HostConfiguration> read = readConfiguration(*options.configurationFile);
    if (read.failed()) return std::move(read.error);
    configuration = std::move(read.value);
  }
  return options.devicePropertiesFile ? deviceProperties.load(*options.devicePropertiesFile) : Status();
}

}  // namespace tarn::linux_host
