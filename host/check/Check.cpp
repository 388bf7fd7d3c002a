// SPDX-License-Identifier: Apache-2.0
#include "host/check/Check.h"

#include <systemd/sd-daemon.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>

#include "host/check/SettingsChecks.h"
#include "host/check/SocketChecks.h"
#include "host/check/StateChecks.h"
#include "host/check/UnitCheck.h"
#include "plist/EscapedText.h"

namespace tarn::linux_host {

CheckSubject subjectOf(ServiceOptions options) {
  CheckSubject subject;
  subject.options = std::move(options);
  subject.isHandedOver = sd_listen_fds(0) > 0;
  if (sd_booted() > 0) {
    const std::string kind = ::geteuid() == 0 ? "system" : "user";
    for (const char* const folder :
         {"/etc/systemd/", "/run/systemd/", "/usr/local/lib/systemd/", "/usr/lib/systemd/"}) {
      subject.unitFolders.push_back(folder + kind);
    }
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
