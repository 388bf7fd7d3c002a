// SPDX-License-Identifier: Apache-2.0
#include "host/LinuxPlatform.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string>
#include <utility>

#include "host/StatusParts.h"
#include "host/log/PrefixedLog.h"
#include "host/loop/Settling.h"
#include "host/loop/WorkOwner.h"
#include "host/settings/MachineFacts.h"
#include "host/system/DescriptorLimit.h"
#include "host/system/Files.h"
#include "host/system/MemoryReserve.h"
#include "host/system/SystemError.h"
#include "plist/formats/Json.h"

namespace tarn::linux_host {

namespace {

constexpr std::string_view kModule = "LinuxPlatform";
// What a commit to a slow disk may take, as it is told to the service manager.
constexpr std::chrono::seconds kLongestCommit{15};
constexpr std::chrono::seconds kLongestFlush{10};
// A shortage is told once in this time.
constexpr std::chrono::seconds kBetweenTellings{1};

// So many pieces may wait for the pool's threads at any rate.
constexpr std::size_t kFewPieces = 256;

// For what is done also when memory is missing for one part of it.
template <class Work>
void tryTo(Work&& work) {
  MemoryReserve::orGiveUp(MemoryReserve::Loss::Work, std::forward<Work>(work));
}

HostLimits withinTheSystem(HostLimits limits) {
  limits.maxConnections = std::min(limits.maxConnections, connectionsWithin(raiseDescriptorLimit()));
  return limits;
}

// Under the recorder's cap stands all that the service writes without end.
recorder::RecorderOptions recorderOptions(const HostConfiguration& configuration, const std::string& stateDirectory,
                                          const JsonDeviceProperties& device, const OverflowFile& overflow) {
  recorder::RecorderOptions options = configuration.recorder;
  options.file = stateDirectory + "/recorder.sqlite3";
  const std::string logs = configuration.paths.diagnosticLogs.value_or(stateDirectory) + "/DiagnosticLogs/Audio/";
  options.files = recorder::diagnosticFileKinds(logs, options.fileMaxAges);
  options.others = overflow.size();
  options.sessionOf = &WorkOwner::current;
  options.version = TARN_VERSION;
  plist::appendJson(options.machine, device.over(readMachineFacts()));
  return options;
}

// What messages that wait on disk may take of it.
std::size_t overflowShare(const recorder::RecorderOptions& options) {
  constexpr std::size_t kShare = 4;
  return (static_cast<std::size_t>(options.maxMegabytes) << 20U) / kShare;
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
                             JsonDeviceProperties deviceProperties, Ground ground)
    : settleTime_(configuration.limits.settleTime),
      endTime_(configuration.limits.endTime),
      separateAdmin_(configuration.access.separateAdmin),
      // Not the machine's own: the names in it are known beforehand, and nobody else is to be in the way.
      temporaryDirectory_(stateDirectory + "/tmp"),
      clock_(ground.clock),
      log_(ground.log),
      serviceManager_(ground.serviceManager),
      settleLog_(std::move(ground.settleLog)),
      setLogLevel_(std::move(ground.setLogLevel)),
      loop_(clock_),
      connections_(loop_, log_, withinTheSystem(configuration.limits)),
      overflow_(stateDirectory, configuration.limits.logs, overflowShare(configuration.recorder)),
      recorderEnabled_(configuration.recorderEnabled),
      recorder_(recorderOptions(configuration, stateDirectory, deviceProperties, overflow_), log_, clock_),
      workQueues_(clock_, loop_.queue(), configuration.limits.poolWork),
      tally_(recorder_, clock_, configuration.tally.inUse),
      wattlog_(recorder_, clock_),
      pylon_(recorder_, clock_),
      snare_(recorder_, clock_, randomSource_, workQueues_, configuration.snare.refuse),
      rtc_(recorder_, clock_, workQueues_, configuration.rtc),
      tattle_(recorder_, clock_, workQueues_),
      gyre_(recorder_, clock_),
      sessionRecords_(recorder_, clock_, &WorkOwner::enter),
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
      statusLine_(loop_, serviceManager_, [this] { return statusNumbers(); }),
      reload_(loop_, log_, serviceManager_, configuration, std::move(ground.readConfiguration),
              [this](const HostConfiguration& inForce) { adopt(inForce); }),
      facilities_(facilitiesOf()) {
  // What comes in is held up while what it becomes piles up.
  recorder_.setRoomHandler([this] { connections_.resumeRequests(); });
  if (LogSessionIds* const ids = ground.sessionIds; ids != nullptr) {
    recorder_.setRunHandler([ids](std::int64_t lastSession) { ids->goOnFrom(lastSession); });
    if (!recorderEnabled_) {
      ids->goOnFrom(0);
    }
  }
  workQueues_.setRoomHandler([this] { connections_.resumeRequests(); });
  connections_.rings.setCommitSource([this] {
    const recorder::RecorderCounters counters = recorder_.counters();
    return CommitPoint{counters.handedOver, counters.committed, workQueues_.unfinished() == 0};
  });
  connections_.gate.setPauseSource([this] { return recorder_.isFull() || workQueues_.isFull(); });
  // Most of what waits for the pool's threads becomes events, so it counts as if it waited for the recorder already.
  connections_.gate.setCrowdSource([this] {
    return recorder_.isCrowded() || workQueues_.isCrowded(std::max(recorder_.roomUntilCrowded(), kFewPieces));
  });
  loop_.addTurnHook([this] { lookForTheEnd(); });
  loop_.addTurnHook([this] { tellLosses(); });
  loop_.addTurnHook([this] {
    const Ledger& ledger = connections_.ledger;
    statusLine_.look(ledger.framesReceived + ledger.messagesReceived + ledger.connectionsTotal +
                     ledger.connectionsOpen);
  });
  if (recorderEnabled_) {
    // What was sent may still be on its way through the workers' own queues.
    connections_.setSettleSource([this](platform::Work done) {
      workQueues_.afterWhatIsUnfinished(
          [this, settlement = recorder::Recorder::settlement(loop_.queue(), std::move(done))]() mutable {
            recorder_.settle(std::move(settlement));
          });
    });
  }
}

platform::Facilities LinuxPlatform::facilitiesOf() {
  const auto standIn = [this](auto& service) { return recorderEnabled_ ? &service : nullptr; };
  platform::SessionRecords* const records =
      recorderEnabled_ ? static_cast<platform::SessionRecords*>(&sessionRecords_) : &countedSessions_;
  platform::TallyService& tally = recorderEnabled_ ? static_cast<platform::TallyService&>(tally_) : noTally_;
  return platform::Facilities{.clock = clock_,
                              .workQueues = workQueues_,
                              .conditions = conditions_,
                              .log = log_,
                              .tracePoints = tracePoints_,
                              .deviceProperties = deviceProperties_,
                              .defaults = defaults_,
                              .notifications = *notifications_,
                              .processFacts = processFacts_,
                              .processControl = *this,
                              .tally = tally,
                              .fileSystem = fileSystem_,
                              .localCalendar = localCalendar_,
                              .randomSource = randomSource_,
                              .processEnvironment = processEnvironment_,
                              .commandRunner = commandRunner_,
                              .wattlog = standIn(wattlog_),
                              .pylon = standIn(pylon_),
                              .snare = standIn(snare_),
                              .tattle = standIn(tattle_),
                              .gyre = standIn(gyre_),
                              .flume = &flume_,
                              .rtcReporting = standIn(rtc_),
                              .performanceTrace = &performanceTrace_,
                              .traceAnalysis = &traceAnalysis_,
                              .perfDataWriters = &perfDataWriters_,
                              .signposts = &signposts_,
                              .overflow = &overflow_,
                              .sessionRecords = records};
}

Status LinuxPlatform::start() {
  if (loop_.setUp().failed()) return loop_.setUp();
  if (const Status made = createDirectories(temporaryDirectory_, 0750); made.failed()) {
    return errorOf(temporaryDirectory_, *made);
  }
  // Threads and memory that the service needs when the system may have none left.
  if (!MemoryReserve::hold()) return Error{ENOMEM, "no memory to keep in reserve"};
  if (!workQueues_.start()) return Error{EAGAIN, "no threads to run on"};
  endDeadline_.prepare([this] { giveUpClients(); });
  if (recorderEnabled_) {
    recorder_.start();
    // A large file is read through first; until that is over nothing could be committed in time.
    recorder_.waitUntilOpened();
  }
  return {};
}

Status LinuxPlatform::listen(ListenSockets sockets, const std::shared_ptr<platform::ListenerDelegate>& delegate,
                             ServiceCount serviceCounts) {
  serviceCounts_ = std::move(serviceCounts);
  connections_.setStatusSource([this](auto onlyUser) { return status(onlyUser); });
  Status listening = listenOn(std::move(sockets.ordinary), ListenSocket::kDefaultMode,
                              separateAdmin_ ? Access::OwnSessions : Access::Everything, delegate);
  if (listening.ok() && sockets.admin) {
    listening = listenOn(std::move(sockets.admin), ListenSocket::kAdminMode, Access::Everything, delegate);
  }
  if (listening.failed()) {
    recorder_.shutdown();
    return listening;
  }
  for (const auto& listener : listeners_) {
    listener->resume();
  }
  serviceManager_.notifyReady();
  statusLine_.start();
  watchdog_.start();
  return {};
}

Status LinuxPlatform::listenOn(ListenSocket socket, mode_t mode, Access access,
                               const std::shared_ptr<platform::ListenerDelegate>& delegate) {
  if (Status listening = socket.listen(mode); listening.failed()) return listening;
  listeners_.push_back(std::make_shared<SocketListener>(connections_, std::move(socket), access));
  listeners_.back()->setDelegate(delegate);
  return {};
}

void LinuxPlatform::closeListeners() {
  for (const auto& listener : listeners_) {
    listener->close();
  }
}

void LinuxPlatform::reload() {
  if (!ending_) {
    reload_.request();
  }
}

void LinuxPlatform::adopt(const HostConfiguration& configuration) {
  if (setLogLevel_) {
    setLogLevel_(configuration.logLevel);
  }
  tally_.setInUse(configuration.tally.inUse);
  rtc_.setBehaviour(configuration.rtc);
  snare_.setRefusal(configuration.snare.refuse);
  recorder_.setRetention(configuration.recorder);
  overflow_.setBounds(configuration.limits.logs, overflowShare(configuration.recorder));
  connections_.adopt(configuration.limits);
}

StatusNumbers LinuxPlatform::statusNumbers() {
  const Ledger& ledger = connections_.ledger;
  return {serviceCounts_().sessions, ledger.connectionsOpen, loop_.queue()->waiting() + workQueues_.unfinished(),
          ledger.messagesReceived};
}

void LinuxPlatform::endClients(platform::UniqueFunction<void()> clientsAreGone) {
  if (std::exchange(ending_, true)) return;
  serviceManager_.notifyStopping(endTime_);
  tryTo([this] {
    logPrefixed(log_, kHostCategory, platform::LogLevel::Default, kModule,
                "ending: " + std::to_string(connections_.ledger.connectionsOpen) + " connections are open");
  });
  clientsAreGone_ = std::move(clientsAreGone);
  endDeadline_.start(endTime_);
  closeListeners();
  connections_.endInputs();
}

// Once a turn: when the last client's end was served, the loop may stop.
void LinuxPlatform::lookForTheEnd() {
  if (!clientsAreGone_ || connections_.ledger.connectionsOpen != 0 || loop_.queue()->waiting() != 0) return;
  // As work of the queue, which is where sessions are stopped. The loop stops whatever comes of that.
  loop_.queue()->async([this] {
    tryTo(std::exchange(clientsAreGone_, {}));
    loop_.stop();
  });
}

// Once a turn: what was given up for want of memory, and how much of the reserve was needed, in one line.
void LinuxPlatform::tellLosses() {
  using Loss = MemoryReserve::Loss;
  const MemoryReserve::Counts now = MemoryReserve::counts();
  if (now == told_ || clock_.monotonic() < nextTelling_) return;
  const MemoryReserve::Counts before = std::exchange(told_, now);
  nextTelling_ = clock_.monotonic() + kBetweenTellings;
  const auto since = [&](Loss loss) { return static_cast<unsigned long long>(now.of(loss) - before.of(loss)); };
  std::array<char, 256> text{};
  static_cast<void>(std::snprintf(text.data(), text.size(),
                                  "out of memory: %llu requests refused, %llu connections closed, %llu pieces of work "
                                  "given up, %llu blocks of the reserve used",
                                  since(Loss::Request), since(Loss::Connection), since(Loss::Work),
                                  static_cast<unsigned long long>(now.blocksUsed - before.blocksUsed)));
  logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule, text.data());
}

// On a thread of its own, while the loop's may be stuck in somebody's work: only what any thread may do.
void LinuxPlatform::giveUpClients() {
  serviceManager_.notifyStopping(kLongestCommit);
  tryTo([this] {
    logPrefixed(
        log_, kHostCategory, platform::LogLevel::Error, kModule,
        "the clients' ends are not served within " + std::to_string(endTime_.count()) + " ms; what is left is dropped");
  });
  if (!recorder_.flush(kLongestFlush)) {
    logPrefixed(log_, kHostCategory, platform::LogLevel::Error, kModule, "not everything could be committed");
  }
  if (settleLog_) {
    settleLog_();
  }
  std::_Exit(0);
}

void LinuxPlatform::serve() {
  loop_.run();
  endDeadline_.cancel();
  tryTo([this] { loop_.queue()->run(std::numeric_limits<std::size_t>::max()); });
  connections_.gathersReplies = false;
  connections_.shares.finishWork();  // requests that were taken are served
  loop_.flushAll();
  end();
}

void LinuxPlatform::exitProcess(int status) {
  connections_.gathersReplies = false;
  loop_.flushAll();  // the replies to what came before
  end();
  std::_Exit(status);
}

plist::Dictionary LinuxPlatform::status(std::optional<std::uint32_t> onlyUser) {
  const recorder::RecorderCounters counters = recorder_.counters();
  plist::Dictionary status =
      connections_.ledger.status(serviceCounts_(), loop_.queue()->waiting() + workQueues_.unfinished(),
                                 {counters.handedOver, counters.committed, counters.waiting, counters.expired,
                                  counters.failed, counters.lostBefore});
  reload_.describe(status);
  status.set("quotas", connections_.quotaUse(onlyUser));
  status.set("out_of_memory", lossStatus());
  status.set("recorder_expired_by_user", expiredStatus(recorder_.expiredByOwner(), onlyUser));
  status.set("recorder_expired_unexported", unexportedStatus(recorder_.unexported()));
  return status;
}

// Takes no more, and makes safe what was taken, also where memory is missing for one part of that.
void LinuxPlatform::end() {
  endDeadline_.cancel();  // of one that is killed while it ends
  serviceManager_.notifyStopping(kLongestCommit);
  watchdog_.stop();
  closeListeners();
  tryTo([this] { settleQueues(); });
  tryTo([this] { performanceTrace_.shutdown(); });  // a trace that isn't finished leaves no half file
  recorder_.shutdown();
  if (settleLog_) {
    settleLog_();
  }
}

// What the workers' own queues hold reaches the recorder too, unless a back-end keeps it waiting.
void LinuxPlatform::settleQueues() {
  if (const std::size_t left = settleWhileShrinking(workQueues_, settleTime_); left > 0) {
    logPrefixed(log_, kHostCategory, platform::LogLevel::Default, kModule,
                std::to_string(left) + " pieces of work of the workers' queues are left undone");
  }
}

}  // namespace tarn::linux_host
