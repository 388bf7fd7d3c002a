// tarnreportingd: options, platform, service, serve. It owns no behaviour; what a part does is told where the part is.
//
// A signal ends the clients in order, with their sessions. The process then ends without tearing the parts down: what
// the back-ends hold is committed, then it exits at once.
#include <cstdlib>
#include <iostream>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "derived/TarnReportingSystemMonitor.h"
#include "host/HostSetup.h"
#include "host/LinuxPlatform.h"
#include "host/log/PrefixedLog.h"
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
    logPrefixed(log, kHostCategory, platform::LogLevel::Default, kModule,
                "reporting is disabled by the service's defaults");
    service->setReportingEnabled(false);
  }
  return service;
}

// Serves until a signal; the exit status.
int serve(LinuxPlatform& platform, HostSetup& setup) {
  MainLoop& loop = platform.loop();
  if (std::string error = platform.start(); !error.empty()) {
    return refuse({std::move(error)});
  }
  std::shared_ptr<TarnReportingService> service;  // before any signal is served
  const auto endInOrder = [&platform, &service](int) {
    service->announceEnd();
    platform.endClients([&service] { service->endSingleMessageSession(); });
  };
  if (std::string error = SignalSource::start(setup.signals, loop, endInOrder); !error.empty()) {
    return refuse({std::move(error)});
  }
  TarnReportingInstallFacilities(&platform.facilities());
  service = makeService(*setup.log);
  // Only now is there anything to connect to: who can reach the service finds it whole, its notifications heard.
  if (std::string error =
          platform.listen(std::move(setup.socket), service, [&service] { return service->sessionCount(); });
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
                         {setup.clock, *setup.log, serviceManager, [&setup] { setup.settleLog(); }});
  const int status = serve(platform, setup);
  setup.settleLog();
  std::_Exit(status);  // other threads still use the platform's parts
}
