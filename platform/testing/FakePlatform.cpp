#include "platform/testing/FakePlatform.h"

#include "service/TarnReportingPlatform.h"

namespace tarn::testing {

FakePlatform::FakePlatform()
    : facilities_{clock,         workQueues,   conditions,     log,  tracePoints, deviceProperties, defaults,
                  notifications, processFacts, processControl, tally} {
  TarnReportingInstallFacilities(&facilities_);
}

FakePlatform::~FakePlatform() {
  workQueues.dropAll();
  TarnReportingInstallFacilities(nullptr);
}

}  // namespace tarn::testing
