// tarnreportingd: options, platform, service, serve. It owns no behaviour; what a part does is told where the part is.
//
// The process ends without tearing the parts down: what the back-ends hold is committed, then it exits at once.
// Sessions are not stopped.
#include <cstdlib>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "derived/TarnReportingSystemMonitor.h"
#include "host/HostSetup.h"
#include "host/LinuxPlatform.h"
#include "host/log/HostLog.h"
#include "host/loop/ServiceManager.h"
#include "host/loop/SignalSource.h"
#include "host/settings/HostPaths.h"
#include "host/settings/ServiceOptions.h"
#include "service/TarnReportingService.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn {
namespace {

using namespace linux_host;

constexpr std::string_view kModule = "main";

// One line for whoever started the service.
int refuse(const Refusal& refusal) {
  std::cerr << "tarnreportingd: " << refusal.complaint << '\n';
  return refusal.exitStatus;
}

std::shared_ptr<TarnReportingService> makeService(platform::Log& log) {
  TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
  std::shared_ptr<TarnReportingService> service = TarnReportingService::create();
  if (TarnReportingSystemMonitor::TarnReportingDefaults()["disable_reporting"].asBool()) {
    hostLog(log, kHostCategory, platform::LogLevel::Default, kModule,
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
  return counts;
}

// Serves until a signal; the exit status.
int serve(LinuxPlatform& platform, HostSetup& setup) {
  MainLoop& loop = platform.loop();
  if (std::string error = platform.start(); !error.empty()) {
    return refuse({std::move(error)});
  }
  if (std::string error = SignalSource::start(setup.signals, loop, [&loop](int) { loop.stop(); }); !error.empty()) {
    return refuse({std::move(error)});
  }
  TarnReportingInstallFacilities(&platform.facilities());
  const std::shared_ptr<TarnReportingService> service = makeService(*setup.log);
  // Only now is there anything to connect to: who can reach the service finds it whole, its notifications heard.
  if (std::string error = platform.listen(std::move(setup.socket), service, [&service] { return countsOf(*service); });
      !error.empty()) {
    return refuse({std::move(error)});
  }
  platform.serve();
  return kExitSuccess;
}

}  // namespace
}  // namespace tarn

int main(int argumentCount, char** arguments) {
  using namespace tarn;
  const ServiceCommand command = parseServiceCommand(argumentCount, arguments, HostEnvironment::current());
  std::cout << command.output << std::flush;
  std::cerr << command.complaint;
  if (!command.options) {
    return command.exitStatus;
  }
  HostSetup setup;
  if (const std::optional<Refusal> refusal = setup.prepare(*command.options)) {
    return refuse(*refusal);
  }
  ServiceManager serviceManager;
  LinuxPlatform platform(setup.configuration, command.options->stateDirectory, setup.deviceProperties,
                         {setup.clock, *setup.log, serviceManager});
  std::_Exit(serve(platform, setup));  // other threads still use the platform's parts
}
