// SPDX-License-Identifier: Apache-2.0
// tarnreportingd: options, platform, service, serve; what a part does is told where the part is. A signal ends the
// clients in order. The process then ends without tearing the parts down, once what the back-ends hold is committed.
#include <csignal>
#include <cstdint>
#include <cstdlib>
#include <exception>
#include <iostream>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "derived/TarnReportingSystemMonitor.h"
#include "host/HostSetup.h"
#include "host/LinuxPlatform.h"
#include "host/check/Check.h"
#include "host/log/PrefixedLog.h"
#include "host/loop/ServiceManager.h"
#include "host/loop/SignalSource.h"
#include "host/settings/HostPaths.h"
#include "host/settings/ServiceOptions.h"
#include "host/system/Heap.h"
#include "host/system/ProgramVersion.h"
#include "host/system/StartWithoutMemory.h"
#include "service/TarnReportingService.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/ProcessState.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionLogMemory.h"

namespace tarn {
namespace {

using namespace linux_host;

int refuse(const std::string& complaint, std::int64_t exitStatus = kExitFailure) {
  std::cerr << "tarnreportingd: " << complaint << '\n';
  return static_cast<int>(exitStatus);
}

std::shared_ptr<TarnReportingService> makeService(platform::Log& log) {
  TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
  std::shared_ptr<TarnReportingService> service = TarnReportingService::create();
  if (TarnReportingSystemMonitor::TarnReportingDefaults()["disable_reporting"].asBool()) {
    logPrefixed(log, kHostCategory, platform::LogLevel::Default, "main",
                "reporting is disabled by the service's defaults");
    service->setReportingEnabled(false);
  }
  return service;
}

ServiceCounts countsOf(const TarnReportingService& service) {
  const TarnReportingMessageCounts& messages = service.messageCounts();
  ServiceCounts counts(service.sessionCount());
  counts.delivered = messages.of(TarnReportingOutcome::Delivered);
  counts.redundant = messages.of(TarnReportingOutcome::Redundant);
  counts.unwanted = messages.of(TarnReportingOutcome::Unwanted);
  counts.undeliverable = messages.of(TarnReportingOutcome::Undeliverable);
  counts.withoutSession = messages.of(TarnReportingOutcome::WithoutSession);
  counts.refused = messages.of(TarnReportingOutcome::Refused);
  const TarnReportingSessionLogMemory::Usage logs = ProcessState::of<TarnReportingSessionLogMemory>()->usage();
  counts.logs = {logs.bytes, logs.overflowBytes, logs.overflowing, logs.failures, logs.lost};
  return counts;
}

int serve(LinuxPlatform& platform, HostSetup& setup) {
  if (const Status started = platform.start(); started.failed()) return refuse(started->text);
  std::shared_ptr<TarnReportingService> service;  // before any signal is served
  const auto heed = [&platform, &service](int signal) {
    if (signal == SIGHUP) return platform.reload();
    service->announceEnd();
    platform.endClients([&service] { service->endSingleMessageSession(); });
  };
  const Status heard = SignalSource::start(setup.signals, platform.loop(), heed);
  if (heard.failed()) return refuse(heard->text);
  TarnReportingInstallFacilities(&platform.facilities());
  service = makeService(*setup.log);
  // Only now is there anything to connect to: who can reach the service finds it whole, its notifications heard.
  const Status listening =
      platform.listen(std::move(setup.sockets), service, [&service] { return countsOf(*service); });
  if (listening.failed()) return refuse(listening->text);
  StartWithoutMemory::over();
  platform.serve();
  return kExitSuccess;
}

int check(const ServiceOptions& options) {
  const std::vector<Check> checks = checkAll(subjectOf(options));
  for (const Check& each : checks) {
    std::cout << lineOf(each) << '\n';
  }
  std::cout.flush();
  return areGood(checks) ? kExitSuccess : kExitConfiguration;
}

int run(int argumentCount, char** arguments) {
  shapeHeap();
  const ServiceCommand command =
      parseServiceCommand(argumentCount, arguments, HostEnvironment::current(), versionOf("tarnreportingd"));
  std::cout << command.output << std::flush;
  if (command.usage.failed()) return refuse(command.usage->text, command.usage->code);
  if (!command.options) return kExitSuccess;
  if (command.options->isCheck) return check(*command.options);
  HostSetup setup;
  const Status prepared = setup.prepare(*command.options);
  if (prepared.failed()) return refuse(prepared->text, prepared->code);
  ServiceManager serviceManager;
  LinuxPlatform platform(setup.configuration, command.options->stateDirectory, setup.deviceProperties,
                         {setup.clock, *setup.log, serviceManager, [&setup] { setup.settleLog(); },
                          [&setup] { return setup.readConfiguration(); },
                          [&setup](platform::LogLevel level) { setup.setLogLevel(level); }, &setup.sessionIds});
  int status = kExitFailure;
  try {
    status = serve(platform, setup);
  } catch (const std::exception& shortage) {  // before anybody can connect
    refuse(StartWithoutMemory::textOf(shortage));
  }
  setup.settleLog();
  std::_Exit(status);  // other threads still use the platform's parts
}

}  // namespace
}  // namespace tarn

int main(int argumentCount, char** arguments) {
  try {
    return tarn::run(argumentCount, arguments);
  } catch (const std::exception& shortage) {
    return tarn::refuse(tarn::linux_host::StartWithoutMemory::textOf(shortage));
  }
}
