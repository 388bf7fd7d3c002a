// SPDX-License-Identifier: Apache-2.0
#include "host/check/SettingsChecks.h"

#include <unistd.h>

#include <cerrno>

#include "host/check/Places.h"
#include "host/settings/JsonDeviceProperties.h"
#include "host/system/SystemError.h"

namespace tarn::linux_host {

Check checkOptions(const ServiceOptions& options) {
  const char* const name = "options";
  const std::string& target = options.logTarget;
  if (target == "stderr" || target == "journal") return good(name, "the log goes to " + target);
  // One that isn't there is made.
  const bool isThere = ::access(target.c_str(), F_OK) == 0;
  if (::access(isThere ? target.c_str() : folderOf(target).c_str(), W_OK) == 0) {
    return good(name, "the log goes to " + target);
  }
  const int error = errno;
  return bad(name, "the log can't go to " + target + errorSuffix(error) + "; name another file with --log-target");
}

Check checkConfiguration(const ServiceOptions& options, HostConfiguration& read) {
  const char* const name = "configuration";
  const auto& named = options.configurationFile;
  const std::string file = named.value_or(options.defaultConfigurationFile);
  if (file.empty()) return good(name, "no file is named, the defaults hold");
  Result<HostConfiguration> result = readConfigurationWithDropIns(file, !named);
  if (result.failed()) return bad(name, result.error->text + "; mend the file");
  read = std::move(result.value);
  const bool isThere = ::access(file.c_str(), F_OK) == 0;
  return good(name, isThere ? file : file + " isn't there, the defaults hold");
}

Check checkDeviceProperties(const ServiceOptions& options) {
  const char* const name = "device-properties";
  const auto& named = options.devicePropertiesFile;
  const std::string file = named.value_or(options.defaultDevicePropertiesFile);
  if (file.empty()) return good(name, "no file is named, the defaults hold");
  JsonDeviceProperties properties;
  const Status loaded = properties.load(file);
  if (loaded.ok()) return good(name, file);
  if (!named && (loaded->code == ENOENT || loaded->code == ENOTDIR)) {
    return good(name, file + " isn't there, the defaults hold");
  }
  return bad(name, loaded->text + "; mend the file");
}

}  // namespace tarn::linux_host
