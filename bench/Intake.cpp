#include "bench/Intake.h"

namespace tarn::bench {

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
