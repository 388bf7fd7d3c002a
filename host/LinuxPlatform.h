// SPDX-License-Identifier: Apache-2.0
// LinuxPlatform: the twin of testing/FakePlatform. It owns the machine's facilities, the loop, and the recorder with
// its stand-ins for the back-ends; it hands them out as Facilities, and knows what holds between them: what comes in is
// held up while what it becomes piles up, what `status` answers, and in which order all of it ends.
//
// Life: start() makes what has threads; listen() lets clients come; serve() lasts until the loop is stopped, after
// which what was taken is safe and the process ends at once. endClients() is the end in order: each client's is served
// as if its connection had closed, then the loop stops. exitProcess() stops no session.
//
// Owned by the entry point. Threads: the main loop's, which is the one that calls serve().
//
// Members stand in the order in which they need each other: those above are there when those below are made. Nothing of
// it is torn down in the service, which ends by _Exit() while other threads still use the parts.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "host/ConfigurationReload.h"
#include "host/CountedSessions.h"
#include "host/NoTallyService.h"
#include "host/StatusLine.h"
#include "host/drivers/AlsaFlume.h"
#include "host/drivers/FlumeFiles.h"
#include "host/drivers/LinuxFlumeService.h"
#include "host/log/LogSessionIds.h"
#include "host/loop/Deadline.h"
#include "host/loop/LinuxConditions.h"
#include "host/loop/LinuxWorkQueues.h"
#include "host/loop/MainLoop.h"
#include "host/loop/ServiceManager.h"
#include "host/loop/Watchdog.h"
#include "host/machine/LinuxCommandRunner.h"
#include "host/machine/LinuxFileSystem.h"
#include "host/machine/LinuxLocalCalendar.h"
#include "host/machine/LinuxProcessEnvironment.h"
#include "host/machine/LinuxProcessFacts.h"
#include "host/machine/LinuxRandomSource.h"
#include "host/machine/OverflowFile.h"
#include "host/settings/FileNotificationCenter.h"
#include "host/settings/HostConfiguration.h"
#include "host/settings/JsonDefaultsStore.h"
#include "host/settings/JsonDeviceProperties.h"
#include "host/socket/ConnectionHost.h"
#include "host/socket/SocketListener.h"
#include "host/system/MemoryReserve.h"
#include "host/traces/LinuxPerfDataWriters.h"
#include "host/traces/LinuxPerformanceTraceService.h"
#include "host/traces/LinuxSignposts.h"
#include "host/traces/LinuxTraceAnalysis.h"
#include "host/traces/LinuxTracePoints.h"
#include "platform/Clock.h"
#include "platform/Facilities.h"
#include "platform/Listener.h"
#include "platform/Log.h"
#include "platform/ProcessControl.h"
#include "platform/UniqueFunction.h"
#include "plist/Result.h"
#include "recorder/Recorder.h"
#include "recorder/RecorderGyreService.h"
#include "recorder/RecorderPylonService.h"
#include "recorder/RecorderRtcReportingService.h"
#include "recorder/RecorderSessionRecords.h"
#include "recorder/RecorderSnareService.h"
#include "recorder/RecorderTallyService.h"
#include "recorder/RecorderTattleService.h"
#include "recorder/RecorderWattlogService.h"

namespace tarn::linux_host {

class LinuxPlatform final : private platform::ProcessControl {
 public:
  // What the service counts; asked on the loop's thread, for each `status`.
  using ServiceCount = platform::UniqueFunction<ServiceCounts()>;
  // What was there before; all of it outlives the platform.
  struct Ground {
    platform::Clock& clock;
    platform::Log& log;
    ServiceManager& serviceManager;
    platform::UniqueFunction<void()> settleLog = {};  // the last thing before the process ends
    ConfigurationReload::Read readConfiguration = {};
    platform::UniqueFunction<void(platform::LogLevel)> setLogLevel = {};
    LogSessionIds* sessionIds = nullptr;  // told where the ids of sessions go on from, when there is one
  };

  // Makes the parts and puts them together: no thread, no file and no client yet. The limit of open descriptors is
  // raised, and connections held below it. The state directory is one that prepareStateDirectory() made.
  LinuxPlatform(const HostConfiguration& configuration, const std::string& stateDirectory,
                JsonDeviceProperties deviceProperties, Ground ground);
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;
  ~LinuxPlatform() override = default;

  // What the process installs. With the recorder switched off there is no back-end but one that wants no analytics
  // events.
  const platform::Facilities& facilities() const noexcept { return facilities_; }
  // For the signals; it runs in serve().
  MainLoop& loop() noexcept { return loop_; }

  // Starts what has threads, and waits until the recorder's file is open: a large one is read through first, as nothing
  // could be committed in time before. Fails when the system gives the loop no descriptors, or for the folder of
  // temporary files. A file that can't be opened is no failure: the recorder tries on. Called once, first.
  [[nodiscard]] Status start();
  // Lets clients connect, once whoever they are handed to is whole; then tells the service manager that it is ready and
  // begins to feed its watchdog. After a failure the recorder is shut down and the process can only end. The delegate
  // isn't held.
  [[nodiscard]] Status listen(ListenSockets sockets, const std::shared_ptr<platform::ListenerDelegate>& delegate,
                              ServiceCount serviceCounts);
  // Takes nobody and nothing more in, serves what each client had sent and then its end, calls `clientsAreGone` and
  // stops the loop. What isn't over by `HostLimits::endTime` is left: what the recorder holds is committed then and the
  // process ends with status 0, whatever the queue is at. A second call does nothing. On the loop's thread, from work
  // or an event of it.
  void endClients(platform::UniqueFunction<void()> clientsAreGone);
  // Reads the configuration anew and takes over what may change, soon; see ConfigurationReload. Nothing while the
  // clients end. On the loop's thread.
  void reload();
  // Serves until the loop is stopped, then serves the requests that were taken and makes safe what the recorder holds.
  // Blocks for the life of the service.
  void serve();

 private:
  // For a client's killService: replies to what came before go out, what was handed over is made safe, and the process
  // is gone with this status. No session is stopped.
  void exitProcess(int status) override;
  platform::Facilities facilitiesOf();
  // The ledger with the recorder's and the service's counts, what waits on all queues, and the quotas.
  plist::Dictionary status(std::optional<std::uint32_t> onlyUser);
  // Makes the listener of a socket that is there.
  Status listenOn(ListenSocket socket, mode_t mode, Access access,
                  const std::shared_ptr<platform::ListenerDelegate>& delegate);
  void closeListeners();
  // What a running service takes over of a configuration.
  void adopt(const HostConfiguration& configuration);
  StatusNumbers statusNumbers();
  // Once a turn, while the clients end: whether the last is gone and nothing waits any more.
  void lookForTheEnd();
  // Once a turn: what was given up for want of memory, in one line a second at the most.
  void tellLosses();
  void giveUpClients();
  // The end in its order: no client, no ping, the workers' queues as far as they get shorter, no trace, the recorder's
  // last commit, the log.
  void end();
  // Lets the workers' queues finish, as long as they get shorter; what is left is told.
  void settleQueues();

  // Constant from the making on.
  const std::chrono::milliseconds settleTime_;
  const std::chrono::milliseconds endTime_;
  const bool separateAdmin_;
  const std::string temporaryDirectory_;
  platform::Clock& clock_;
  platform::Log& log_;
  ServiceManager& serviceManager_;
  platform::UniqueFunction<void()> settleLog_;
  platform::UniqueFunction<void(platform::LogLevel)> setLogLevel_;
  // What stands between clients and the service.
  MainLoop loop_;
  // Outlives the listener, and with it every connection.
  ConnectionHost connections_;
  OverflowFile overflow_;
  const bool recorderEnabled_;  // false: it never starts, and no stand-in is handed out
  // Outlives the stand-ins below, which record into it.
  recorder::Recorder recorder_;
  // The queues, and the stand-ins for the back-ends that answer on them.
  LinuxWorkQueues workQueues_;
  // The stand-ins for the back-ends, each recording under its own name.
  LinuxRandomSource randomSource_;
  recorder::RecorderTallyService tally_;
  NoTallyService noTally_;
  recorder::RecorderWattlogService wattlog_;
  recorder::RecorderPylonService pylon_;
  recorder::RecorderSnareService snare_;
  recorder::RecorderRtcReportingService rtc_;
  recorder::RecorderTattleService tattle_;
  recorder::RecorderGyreService gyre_;
  recorder::RecorderSessionRecords sessionRecords_;
  CountedSessions countedSessions_;
  // The facilities that are the machine's own.
  LinuxConditions conditions_;
  JsonDefaultsStore defaults_;
  const std::shared_ptr<FileNotificationCenter> notifications_;
  // What reports ask of the machine.
  LinuxProcessFacts processFacts_;
  LinuxFileSystem fileSystem_;
  // The driver report channels: the sources, then the service that offers them.
  FlumeFiles flumeFiles_;
  std::optional<AlsaFlume> alsaFlume_;  // of a device that is told where its sound hardware is
  LinuxFlumeService flume_;
  // Performance traces, from the signposts to their analysis.
  LinuxSignposts signposts_;
  LinuxTracePoints tracePoints_;
  LinuxPerformanceTraceService performanceTrace_;
  LinuxTraceAnalysis traceAnalysis_;
  LinuxLocalCalendar localCalendar_;
  LinuxProcessEnvironment processEnvironment_;
  LinuxCommandRunner commandRunner_;
  LinuxPerfDataWriters perfDataWriters_;
  JsonDeviceProperties deviceProperties_;
  // The service's life.
  Watchdog watchdog_;
  StatusLine statusLine_;
  ConfigurationReload reload_;
  // From listen() on.
  ServiceCount serviceCounts_;
  std::vector<std::shared_ptr<SocketListener>> listeners_;
  platform::UniqueFunction<void()> clientsAreGone_;  // set while the clients' ends are served
  bool ending_ = false;
  MemoryReserve::Counts told_ = MemoryReserve::counts();
  std::chrono::nanoseconds nextTelling_{};
  Deadline endDeadline_;
  const platform::Facilities facilities_;
};

}  // namespace tarn::linux_host
