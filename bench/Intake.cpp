// SPDX-License-Identifier: Apache-2.0
#include "bench/Intake.h"

namespace tarn::bench {

std::shared_ptr<TarnReportingSession> makeSession(AudioServiceType serviceType) {
  const plist::Dictionary configuration{{"HostApplicationDisplayID", "sys.oxbow.music"}};
  auto session = TarnReportingSession::initWithID(kReporterID, {1});
  session->setServiceType(serviceType);
  session->updateConfigurationWithContentsOfConfiguration(&configuration);
  session->start();
  return session;
}

TarnReportingSession::MessagePointer Feeder::makeRecord() {
  renumber(request_, ++number_);
  return std::make_shared<TarnReportingSessionMessage>(request_.dictionary, AudioEventCategory::Playback, type_);
}

}  // namespace tarn::bench
