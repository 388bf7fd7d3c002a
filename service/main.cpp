// tarnreportingd: puts the parts together and serves. It owns no behaviour; what a part does is told where the part is.
//
// The process ends without tearing the parts down: what the back-ends hold is committed, then it exits at once.
// Sessions are not stopped.
#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <iostream>
#include <limits>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#include "derived/TarnReportingSystemMonitor.h"
#include "host/drivers/AlsaFlume.h"
#include "host/drivers/FlumeFiles.h"
#include "host/drivers/LinuxFlumeService.h"
#include "host/log/HostLog.h"
#include "host/log/LogTarget.h"
#include "host/loop/LinuxConditions.h"
#include "host/loop/LinuxWorkQueues.h"
#include "host/loop/MainLoop.h"
#include "host/loop/ServiceManager.h"
#include "host/loop/SignalSource.h"
#include "host/loop/Watchdog.h"
#include "host/machine/LinuxClock.h"
#include "host/machine/LinuxCommandRunner.h"
#include "host/machine/LinuxFileSystem.h"
#include "host/machine/LinuxLocalCalendar.h"
#include "host/machine/LinuxProcessEnvironment.h"
#include "host/machine/LinuxProcessFacts.h"
#include "host/machine/LinuxRandomSource.h"
#include "host/settings/FileNotificationCenter.h"
#include "host/settings/HostConfiguration.h"
#include "host/settings/HostPaths.h"
#include "host/settings/JsonDefaultsStore.h"
#include "host/settings/JsonDeviceProperties.h"
#include "host/settings/ServiceOptions.h"
#include "host/settings/StateFolder.h"
#include "host/socket/ConnectionHost.h"
#include "host/socket/SocketListener.h"
#include "host/system/DescriptorLimit.h"
#include "host/system/FileLock.h"
#include "host/traces/LinuxPerfDataWriters.h"
#include "host/traces/LinuxPerformanceTraceService.h"
#include "host/traces/LinuxSignposts.h"
#include "host/traces/LinuxTraceAnalysis.h"
#include "host/traces/LinuxTracePoints.h"
#include "platform/Facilities.h"
#include "platform/ProcessControl.h"
#include "recorder/Recorder.h"
#include "recorder/RecorderGyreService.h"
#include "recorder/RecorderPylonService.h"
#include "recorder/RecorderRtcReportingService.h"
#include "recorder/RecorderSnareService.h"
#include "recorder/RecorderTallyService.h"
#include "recorder/RecorderTattleService.h"
#include "recorder/RecorderWattlogService.h"
#include "service/TarnReportingService.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"

namespace tarn {
namespace {

using namespace linux_host;

constexpr std::string_view kModule = "main";
// For how long the end waits for the workers' own queues without seeing them get shorter.
constexpr std::chrono::milliseconds kSettleTime{500};

// What is read before anything runs.
struct Setup {
  ServiceOptions options;
  HostConfiguration configuration;
  JsonDeviceProperties deviceProperties;
};

// One line for whoever started the service.
int refuse(const std::string& complaint, int status) {
  std::cerr << "tarnreportingd: " << complaint << '\n';
  return status;
}

HostLimits limitsOf(const HostConfiguration& configuration) {
  HostLimits limits = configuration.limits;
  limits.maxConnections = std::min(limits.maxConnections, connectionsWithin(raiseDescriptorLimit()));
  return limits;
}

recorder::RecorderOptions recorderOptionsOf(const Setup& setup) {
  recorder::RecorderOptions options = setup.configuration.recorder;
  options.file = setup.options.stateDirectory + "/recorder.sqlite3";
  return options;
}

// Not the machine's own: the names in it are known beforehand, and nobody else is to be in the way.
std::string temporaryDirectoryOf(const Setup& setup) {
  return setup.options.stateDirectory + "/tmp";
}

LinuxFileSystem::Directories directoriesOf(const Setup& setup) {
  return {setup.configuration.paths.diagnosticLogs.value_or(setup.options.stateDirectory) + "/DiagnosticLogs",
          temporaryDirectoryOf(setup)};
}

std::string flumeFolderOf(const Setup& setup) {
  return setup.configuration.paths.flume.value_or(setup.options.stateDirectory + "/flume");
}

// The machine's facilities, the recorder in place of its back-ends, and the service on top.
class Host final : public platform::ProcessControl {
 public:
  Host(const Setup& setup, LinuxClock& clock, platform::Log& log, const std::shared_ptr<SignalSource>& signals)
      : log_(log),
        signals_(signals),
        loop_(clock),
        connections_(loop_, log, limitsOf(setup.configuration)),
        recorder_(recorderOptionsOf(setup), log, clock),
        workQueues_(clock, loop_.queue(), setup.configuration.limits.poolWork),
        tally_(recorder_, clock, setup.configuration.tally.inUse),
        wattlog_(recorder_, clock),
        pylon_(recorder_, clock),
        snare_(recorder_, clock, randomSource_, workQueues_, setup.configuration.snare.refuse),
        rtc_(recorder_, clock, workQueues_, setup.configuration.rtc),
        tattle_(recorder_, clock, workQueues_),
        gyre_(recorder_, clock),
        conditions_(loop_),
        defaults_(setup.options.stateDirectory + "/defaults", log),
        notifications_(
            std::make_shared<FileNotificationCenter>(setup.options.stateDirectory + "/notifications", loop_, log)),
        fileSystem_(directoriesOf(setup)),
        flumeFiles_(flumeFolderOf(setup), log),
        flume_(flumeSources(setup, log, clock)),
        signposts_(clock),
        tracePoints_(signposts_),
        performanceTrace_({signposts_, fileSystem_, clock, processFacts_, log}),
        traceAnalysis_(setup.configuration.paths.traceAnalysis.value_or(LinuxTraceAnalysis::defaultPath()), log),
        deviceProperties_(setup.deviceProperties),
        clock_(clock),
        watchdog_(clock, loop_.progress(), serviceManager_) {}

  // Serves until a signal; the exit status.
  int serve(ListenSocket socket) {
    if (!loop_.startError().empty()) {
      return refuse(loop_.startError(), kExitFailure);
    }
    if (const std::string error = SignalSource::start(signals_, loop_, [this](int) { loop_.stop(); }); !error.empty()) {
      return refuse(error, kExitFailure);
    }
    setUpPauses();
    startRecorder();
    TarnReportingInstallFacilities(&facilities_);
    TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
    service_ = TarnReportingService::create();
    if (TarnReportingSystemMonitor::TarnReportingDefaults()["disable_reporting"].asBool()) {
      hostLog(log_, kHostCategory, platform::LogLevel::Default, kModule,
              "reporting is disabled by the service's defaults");
      service_->setReportingEnabled(false);
    }
    // Only now is there anything to connect to: who can reach the service finds it whole, its notifications heard.
    if (const std::string error = socket.listen(); !error.empty()) {
      recorder_.shutdown();
      return refuse(error, kExitFailure);
    }
    connections_.setStatusSource([this] { return status(); });
    listener_ = std::make_shared<SocketListener>(connections_, std::move(socket));
    listener_->setDelegate(service_);
    listener_->resume();
    serviceManager_.notifyReady();
    watchdog_.start();
    loop_.run();
    loop_.queue()->run(std::numeric_limits<std::size_t>::max());  // requests that were taken are served
    loop_.flushAll();
    end();
    return kExitSuccess;
  }

  void exitProcess(int status) override {
    loop_.flushAll();  // the replies to what came before
    end();
    std::_Exit(status);
  }

 private:
  // What comes in is held up while what it becomes piles up.
  void setUpPauses() {
    recorder_.setRoomHandler([this] { connections_.resumeRequests(); });
    workQueues_.setRoomHandler([this] { connections_.resumeRequests(); });
    connections_.gate.setPauseSource([this] { return recorder_.isFull() || workQueues_.isFull(); });
  }

  void startRecorder() {
    recorder_.start();
    // A large file is read through first; until that is over nothing could be committed in time.
    recorder_.waitUntilOpened();
  }

  plist::Dictionary status() {
    const recorder::RecorderCounters counters = recorder_.counters();
    return connections_.ledger.status(
        service_->sessionCount(), loop_.queue()->waiting() + workQueues_.unfinished(),
        {counters.handedOver, counters.committed, counters.waiting, counters.expired, counters.failed});
  }

  // Takes no more, and makes safe what was taken.
  void end() {
    serviceManager_.notifyStopping();
    watchdog_.stop();
    listener_->close();
    settleQueues();
    performanceTrace_.shutdown();  // a trace that isn't finished leaves no half file
    recorder_.shutdown();
  }

  // What the workers' own queues hold reaches the recorder too, unless a back-end keeps it waiting.
  void settleQueues() {
    std::size_t left = workQueues_.unfinished();
    while (!workQueues_.settle(kSettleTime)) {
      const std::size_t before = std::exchange(left, workQueues_.unfinished());
      if (left >= before) {
        hostLog(log_, kHostCategory, platform::LogLevel::Default, kModule,
                std::to_string(left) + " pieces of work of the workers' queues are left undone");
        return;
      }
    }
  }

  // Makes the source that only some devices have.
  std::vector<FlumeSource*> flumeSources(const Setup& setup, platform::Log& log, const platform::Clock& clock) {
    std::vector<FlumeSource*> sources{&flumeFiles_};
    if (const std::optional<std::string>& tree = setup.configuration.paths.alsa) {
      sources.push_back(&alsaFlume_.emplace(*tree, log, clock));
    }
    return sources;
  }

  platform::Log& log_;
  const std::shared_ptr<SignalSource> signals_;
  MainLoop loop_;
  ConnectionHost connections_;
  recorder::Recorder recorder_;
  LinuxWorkQueues workQueues_;
  recorder::RecorderTallyService tally_;
  recorder::RecorderWattlogService wattlog_;
  recorder::RecorderPylonService pylon_;
  LinuxRandomSource randomSource_;
  recorder::RecorderSnareService snare_;
  recorder::RecorderRtcReportingService rtc_;
  recorder::RecorderTattleService tattle_;
  recorder::RecorderGyreService gyre_;
  LinuxConditions conditions_;
  JsonDefaultsStore defaults_;
  const std::shared_ptr<FileNotificationCenter> notifications_;
  LinuxProcessFacts processFacts_;
  LinuxFileSystem fileSystem_;
  FlumeFiles flumeFiles_;
  std::optional<AlsaFlume> alsaFlume_;  // of a device that is told where its sound hardware is
  LinuxFlumeService flume_;
  LinuxSignposts signposts_;
  LinuxTracePoints tracePoints_;
  LinuxPerformanceTraceService performanceTrace_;
  LinuxTraceAnalysis traceAnalysis_;
  LinuxLocalCalendar localCalendar_;
  LinuxProcessEnvironment processEnvironment_;
  LinuxCommandRunner commandRunner_;
  LinuxPerfDataWriters perfDataWriters_;
  JsonDeviceProperties deviceProperties_;
  LinuxClock& clock_;
  ServiceManager serviceManager_;
  Watchdog watchdog_;
  std::shared_ptr<TarnReportingService> service_;
  std::shared_ptr<SocketListener> listener_;
  const platform::Facilities facilities_{.clock = clock_,
                                         .workQueues = workQueues_,
                                         .conditions = conditions_,
                                         .log = log_,
                                         .tracePoints = tracePoints_,
                                         .deviceProperties = deviceProperties_,
                                         .defaults = defaults_,
                                         .notifications = *notifications_,
                                         .processFacts = processFacts_,
                                         .processControl = *this,
                                         .tally = tally_,
                                         .fileSystem = fileSystem_,
                                         .localCalendar = localCalendar_,
                                         .randomSource = randomSource_,
                                         .processEnvironment = processEnvironment_,
                                         .commandRunner = commandRunner_,
                                         .wattlog = &wattlog_,
                                         .pylon = &pylon_,
                                         .snare = &snare_,
                                         .tattle = &tattle_,
                                         .gyre = &gyre_,
                                         .flume = &flume_,
                                         .rtcReporting = &rtc_,
                                         .performanceTrace = &performanceTrace_,
                                         .traceAnalysis = &traceAnalysis_,
                                         .perfDataWriters = &perfDataWriters_,
                                         .signposts = &signposts_};
};

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
    makeFolder(options.socketPath->substr(0, options.socketPath->rfind('/')), 0755);  // binding tells when it failed
  }
  return ListenSocket::claim(*options.socketPath);
}

int serve(Setup& setup) {
  if (setup.options.configurationFile) {
    ReadConfiguration read = readConfiguration(*setup.options.configurationFile);
    if (!read.configuration) {
      return refuse(read.error, kExitConfiguration);
    }
    setup.configuration = std::move(*read.configuration);
  }
  if (setup.options.devicePropertiesFile) {
    if (const std::string error = setup.deviceProperties.load(*setup.options.devicePropertiesFile); !error.empty()) {
      return refuse(error, kExitConfiguration);
    }
  }
  if (const std::string error = prepareStateDirectory(setup.options.stateDirectory); !error.empty()) {
    return refuse(error, kExitFailure);
  }
  if (const int error = makeFolder(temporaryDirectoryOf(setup), 0750); error != 0) {
    return refuse(temporaryDirectoryOf(setup) + errorSuffix(error), kExitFailure);
  }
  const auto signals = std::make_shared<SignalSource>();  // before any thread
  ListenSocket::Result socket = openSocket(setup.options);
  if (!socket.socket) {
    return refuse(socket.error, kExitFailure);
  }
  FileLock stateLock;
  if (const std::string error = holdStateDirectory(setup.options.stateDirectory, stateLock); !error.empty()) {
    return refuse(error, kExitFailure);
  }
  LinuxClock clock;
  OpenedLog log = openLog(setup.options.logTarget, setup.options.logLevel, clock);
  if (!log.log) {
    return refuse(log.error, kExitFailure);
  }
  Host host(setup, clock, *log.log, signals);
  const int status = host.serve(std::move(socket.socket));
  std::_Exit(status);  // other threads still use the host's parts
}

}  // namespace
}  // namespace tarn

int main(int argumentCount, char** arguments) {
  using namespace tarn;
  const linux_host::ServiceCommand command =
      linux_host::parseServiceCommand(argumentCount, arguments, linux_host::HostEnvironment::current());
  std::cout << command.output << std::flush;
  std::cerr << command.complaint;
  if (!command.options) {
    return command.exitStatus;
  }
  Setup setup{*command.options, {}, {}};
  return serve(setup);
}
