// SPDX-License-Identifier: Apache-2.0
#include "host/check/Check.h"

#include <systemd/sd-daemon.h>
#include <systemd/sd-path.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "host/check/SettingsChecks.h"
#include "host/check/SocketChecks.h"
#include "host/check/StateChecks.h"
#include "host/check/UnitCheck.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

namespace {

// Where the service manager that this user has looks for units, in its order.
std::vector<std::string> unitFolders() {
  char** found = nullptr;
  const bool isRoot = ::geteuid() == 0;
  if (sd_path_lookup_strv(isRoot ? SD_PATH_SYSTEMD_SEARCH_SYSTEM_UNIT : SD_PATH_SYSTEMD_SEARCH_USER_UNIT, nullptr,
                          &found) < 0) {
    return {};
  }
  const std::unique_ptr<char*, decltype(&std::free)> list(found, &std::free);
  std::vector<std::string> folders;
  for (char** folder = found; *folder != nullptr; ++folder) {
    const std::unique_ptr<char, decltype(&std::free)> name(*folder, &std::free);
    folders.emplace_back(name.get());
  }
  return folders;
}

}  // namespace

CheckSubject subjectOf(ServiceOptions options) {
  CheckSubject subject;
  subject.options = std::move(options);
  subject.isHandedOver = sd_listen_fds(0) > 0;
  if (sd_booted() > 0) {
    subject.unitFolders = unitFolders();
  }
  return subject;
}

std::vector<Check> checkAll(const CheckSubject& subject) {
  const ServiceOptions& options = subject.options;
  HostConfiguration configuration;
  std::vector<Check> checks;
  checks.push_back(checkOptions(options));
  checks.push_back(checkConfiguration(options, configuration));
  checks.push_back(checkDeviceProperties(options));
  checks.push_back(checkStateDirectory(options.stateDirectory));
  checks.push_back(checkStore(options.stateDirectory, configuration.recorderEnabled));
  checks.push_back(checkSpace(options.stateDirectory, configuration));
  checks.push_back(checkSocketDirectory(subject));
  checks.push_back(checkSocket(subject));
  if (configuration.access.separateAdmin) {
    checks.push_back(checkAdminSocket(subject));
  }
  checks.push_back(checkUnit(subject));
  return checks;
}

bool areGood(const std::vector<Check>& checks) noexcept {
  return std::all_of(checks.begin(), checks.end(), [](const Check& check) { return check.isGood; });
}

std::string lineOf(const Check& check) {
  std::string line = check.isGood ? "good " : "bad ";
  line += check.name + ": ";
  plist::appendPrintable(line, check.text, plist::LineEnds::Escaped);
  return line;
}

}  // namespace tarn::linux_host
