#include "bench/Intake.h"

#include "service/TarnReportingPlatform.h"
#include "service/TarnReportingWorkerClasses.h"

namespace tarn::bench {

IntakePlatform::IntakePlatform()
    : facilities_{.clock = clock_,
                  .workQueues = fakes_.workQueues,
                  .conditions = fakes_.conditions,
                  .log = fakes_.log,
                  .tracePoints = tracePoints_,
                  .deviceProperties = fakes_.deviceProperties,
                  .defaults = fakes_.defaults,
                  .notifications = fakes_.notifications,
                  .processFacts = fakes_.processFacts,
                  .processControl = fakes_.processControl,
                  .tally = tally_,
                  .fileSystem = fakes_.fileSystem,
                  .localCalendar = fakes_.localCalendar,
                  .randomSource = fakes_.randomSource,
                  .processEnvironment = fakes_.processEnvironment,
                  .commandRunner = fakes_.commandRunner,
                  .signposts = &signposts_} {
  fakes_.log.setThreshold(platform::LogLevel::Error);
  TarnReportingInstallFacilities(&facilities_);
  TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
}

std::shared_ptr<TarnReportingSession> makeSession() {
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  auto session = TarnReportingSession::initWithID(kReporterID, {1});
  session->setServiceType(AudioServiceType::Generic);
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  return session;
}

TarnReportingSession::MessagePointer Feeder::makeRecord() {
  renumber(request_, ++number_);
  return std::make_shared<TarnReportingSessionMessage>(request_.dictionary, AudioEventCategory::Playback,
                                                       AudioEventType::Start);
}

}  // namespace tarn::bench
