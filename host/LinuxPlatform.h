// LinuxPlatform: the twin of testing/FakePlatform. It owns the machine's facilities, the loop, and the recorder with
// its stand-ins for the back-ends; it hands them out as Facilities, and knows what holds between them: what comes in is
// held up while what it becomes piles up, what `status` answers, and in which order all of it ends.
//
// Life: start() makes what has threads; listen() lets clients come; serve() lasts until the loop is stopped, after
// which what was taken is safe and the process ends at once. endClients() is the end in order: each client's is served
// as if its connection had closed, then the loop stops. exitProcess() stops no session.
//
// Owned by the entry point. Threads: the main loop's, which is the one that calls serve().
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "host/NoTallyService.h"
#include "host/drivers/AlsaFlume.h"
#include "host/drivers/FlumeFiles.h"
#include "host/drivers/LinuxFlumeService.h"
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
#include "recorder/RecorderSnareService.h"
#include "recorder/RecorderTallyService.h"
#include "recorder/RecorderTattleService.h"
#include "recorder/RecorderWattlogService.h"

namespace tarn::linux_host {

class LinuxPlatform final : private platform::ProcessControl {
 public:
  // What the service counts; asked on the loop's thread.
  using ServiceCount = platform::UniqueFunction<ServiceCounts()>;
  // What was there before; all of it outlives the platform.
  struct Ground {
    platform::Clock& clock;
    platform::Log& log;
    ServiceManager& serviceManager;
    platform::UniqueFunction<void()> settleLog = {};  // the last thing before the process ends
  };

  // The state directory is one that prepareStateDirectory() made.
  LinuxPlatform(const HostConfiguration& configuration, const std::string& stateDirectory,
                JsonDeviceProperties deviceProperties, Ground ground);
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;
  ~LinuxPlatform() override = default;

  // What the process installs.
  const platform::Facilities& facilities() const noexcept { return facilities_; }
  MainLoop& loop() noexcept { return loop_; }

  // Starts what has threads, and waits until the recorder's file is open.
  [[nodiscard]] Status start();
  // Lets clients connect, once whoever they are handed to is whole.
  [[nodiscard]] Status listen(ListenSocket socket, const std::shared_ptr<platform::ListenerDelegate>& delegate,
                              ServiceCount serviceCounts);
  // Takes nobody and nothing more in, serves what each client had sent and then its end, calls `clientsAreGone` and
  // stops the loop. What isn't over by `HostLimits::endTime` is left: what the recorder holds is committed then and the
  // process ends with status 0, whatever the queue is at. A second call does nothing. On the loop's thread, from work
  // or an event of it.
  void endClients(platform::UniqueFunction<void()> clientsAreGone);
  // Serves until the loop is stopped, then serves the requests that were taken and makes safe what the recorder holds.
  void serve();

 private:
  void exitProcess(int status) override;
  platform::Facilities facilitiesOf();
  plist::Dictionary status();
  void lookForTheEnd();
  void giveUpClients();
  void end();
  void settleQueues();

  const std::chrono::milliseconds settleTime_;
  const std::chrono::milliseconds endTime_;
  const std::string temporaryDirectory_;
  platform::Clock& clock_;
  platform::Log& log_;
  ServiceManager& serviceManager_;
  platform::UniqueFunction<void()> settleLog_;
  MainLoop loop_;
  ConnectionHost connections_;
  OverflowFile overflow_;
  const bool recorderEnabled_;  // false: it never starts, and no stand-in is handed out
  recorder::Recorder recorder_;
  LinuxWorkQueues workQueues_;
  LinuxRandomSource randomSource_;
  recorder::RecorderTallyService tally_;
  NoTallyService noTally_;
  recorder::RecorderWattlogService wattlog_;
  recorder::RecorderPylonService pylon_;
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
  Watchdog watchdog_;
  ServiceCount serviceCounts_;
  std::shared_ptr<SocketListener> listener_;
  platform::UniqueFunction<void()> clientsAreGone_;  // set while the clients' ends are served
  bool ending_ = false;
  Deadline endDeadline_;
  const platform::Facilities facilities_;
};

}  // namespace tarn::linux_host
