#include "host/LinuxPlatform.h"

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <limits>
#include <utility>

#include "host/log/HostLog.h"
#include "host/settings/StateFolder.h"
#include "host/system/DescriptorLimit.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "LinuxPlatform";

HostLimits withinTheSystem(HostLimits limits) {
  limits.maxConnections = std::min(limits.maxConnections, connectionsWithin(raiseDescriptorLimit()));
  return limits;
}

recorder::RecorderOptions inFolder(recorder::RecorderOptions options, const std::string& stateDirectory) {
  options.file = stateDirectory + "/recorder.sqlite3";
  return options;
}

// The source that only some devices have beside the files'.
std::vector<FlumeSource*> sources(FlumeFiles& files, std::optional<AlsaFlume>& alsa) {
  std::vector<FlumeSource*> sources{&files};
  if (alsa) {
    sources.push_back(&*alsa);
  }
  return sources;
}

}  // namespace

LinuxPlatform::LinuxPlatform(const HostConfiguration& configuration, const std::string& stateDirectory,
                             JsonDeviceProperties deviceProperties, const Ground& ground)
    : settleTime_(configuration.limits.settleTime),
      // Not the machine's own: the names in it are known beforehand, and nobody else is to be in the way.
      temporaryDirectory_(stateDirectory + "/tmp"),
      clock_(ground.clock),
      log_(ground.log),
      serviceManager_(ground.serviceManager),
      loop_(clock_),
      connections_(loop_, log_, withinTheSystem(configuration.limits)),
      recorder_(inFolder(configuration.recorder, stateDirectory), log_, clock_),
      workQueues_(clock_, loop_.queue(), configuration.limits.poolWork),
      tally_(recorder_, clock_, configuration.tally.inUse),
      wattlog_(recorder_, clock_),
      pylon_(recorder_, clock_),
      snare_(recorder_, clock_, randomSource_, workQueues_, configuration.snare.refuse),
      rtc_(recorder_, clock_, workQueues_, configuration.rtc),
      tattle_(recorder_, clock_, workQueues_),
      gyre_(recorder_, clock_),
      conditions_(loop_),
      defaults_(stateDirectory + "/defaults", log_),
      notifications_(std::make_shared<FileNotificationCenter>(stateDirectory + "/notifications", loop_, log_)),
      fileSystem_(
          {configuration.paths.diagnosticLogs.value_or(stateDirectory) + "/DiagnosticLogs", temporaryDirectory_}),
      flumeFiles_(configuration.paths.flume.value_or(stateDirectory + "/flume"), log_),
      alsaFlume_(configuration.paths.alsa
                     ? std::optional<AlsaFlume>(std::in_place, *configuration.paths.alsa, log_, clock_)
                     : std::nullopt),
      flume_(sources(flumeFiles_, alsaFlume_)),
      signposts_(clock_),
      tracePoints_(signposts_),
      performanceTrace_({signposts_, fileSystem_, clock_, processFacts_, log_}),
      traceAnalysis_(configuration.paths.traceAnalysis.value_or(LinuxTraceAnalysis::defaultPath()), log_),
      deviceProperties_(std::move(deviceProperties)),
      watchdog_(clock_, loop_.progress(), serviceManager_),
      facilities_{.clock = clock_,
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
                  .signposts = &signposts_} {
  // What comes in is held up while what it becomes piles up.
  recorder_.setRoomHandler([this] { connections_.resumeRequests(); });
  workQueues_.setRoomHandler([this] { connections_.resumeRequests(); });
  connections_.rings.setCommitSource([this] {
    const recorder::RecorderCounters counters = recorder_.counters();
    return CommitPoint{counters.handedOver, counters.committed, workQueues_.unfinished() == 0};
  });
  connections_.gate.setPauseSource([this] { return recorder_.isFull() || workQueues_.isFull(); });
}

std::string LinuxPlatform::start() {
  if (!loop_.startError().empty()) {
    return loop_.startError();
  }
  if (const int error = makeFolder(temporaryDirectory_, 0750); error != 0) {
    return temporaryDirectory_ + errorSuffix(error);
  }
  recorder_.start();
  // A large file is read through first; until that is over nothing could be committed in time.
  recorder_.waitUntilOpened();
  return {};
}

std::string LinuxPlatform::listen(ListenSocket socket, const std::shared_ptr<platform::ListenerDelegate>& delegate,
                                  SessionCount sessionCount) {
  if (std::string error = socket.listen(); !error.empty()) {
    recorder_.shutdown();
    return error;
  }
  sessionCount_ = std::move(sessionCount);
  connections_.setStatusSource([this] { return status(); });
  listener_ = std::make_shared<SocketListener>(connections_, std::move(socket));
  listener_->setDelegate(delegate);
  listener_->resume();
  serviceManager_.notifyReady();
  watchdog_.start();
  return {};
}

void LinuxPlatform::serve() {
  loop_.run();
  loop_.queue()->run(std::numeric_limits<std::size_t>::max());  // requests that were taken are served
  loop_.flushAll();
  end();
}

void LinuxPlatform::exitProcess(int status) {
  loop_.flushAll();  // the replies to what came before
  end();
  std::_Exit(status);
}

plist::Dictionary LinuxPlatform::status() {
  const recorder::RecorderCounters counters = recorder_.counters();
  return connections_.ledger.status(
      sessionCount_(), loop_.queue()->waiting() + workQueues_.unfinished(),
      {counters.handedOver, counters.committed, counters.waiting, counters.expired, counters.failed});
}

// Takes no more, and makes safe what was taken.
void LinuxPlatform::end() {
  serviceManager_.notifyStopping();
  watchdog_.stop();
  listener_->close();
  settleQueues();
  performanceTrace_.shutdown();  // a trace that isn't finished leaves no half file
  recorder_.shutdown();
}

// What the workers' own queues hold reaches the recorder too, unless a back-end keeps it waiting.
void LinuxPlatform::settleQueues() {
  std::size_t left = workQueues_.unfinished();
  while (!workQueues_.settle(settleTime_)) {
    const std::size_t before = std::exchange(left, workQueues_.unfinished());
    if (left >= before) {
      hostLog(log_, kHostCategory, platform::LogLevel::Default, kModule,
              std::to_string(left) + " pieces of work of the workers' queues are left undone");
      return;
    }
  }
}

}  // namespace tarn::linux_host
