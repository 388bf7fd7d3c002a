// SPDX-License-Identifier: Apache-2.0
#include "service/TarnReportingWorkerClasses.h"

#include <algorithm>
#include <array>

#include "derived/TarnReportingSessionInputMessagesWorker.h"
#include "derived/TarnReportingSessionLagoonMessagesWorker.h"
#include "derived/TarnReportingSessionSummaryJsonFileWorker.h"
#include "derived/TarnReportingSessionSystemMonitorWorker.h"
#include "derived/TarnReportingSessionVolumeMessagesWorker.h"
#include "diagnostics/TarnReportingSessionDPWorker.h"
#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"
#include "diagnostics/TarnReportingSessionTattleWorker.h"
#include "diagnostics/TarnReportingSessionWattlogWorker.h"
#include "diagnostics/drivers/TarnReportingSessionDriverSnapshotWorker.h"
#include "diagnostics/pylon/TarnReportingSessionPylonWorker.h"
#include "diagnostics/snare/TarnReportingSessionSnareWorker.h"
#include "session/TarnReportingSessionSummaryWorker.h"
#include "session/TarnReportingSessionTallyWorker.h"
#include "telemetry/registration/TarnReportingSessionAudioRegistrationWorker.h"
#include "telemetry/rtc/TarnReportingSessionRtcWorker.h"
#include "telemetry/trace/TarnReportingSessionTraceWorker.h"

namespace tarn {

namespace {

template <class... Workers>
constexpr std::array<TarnReportingSessionWorkerClass, sizeof...(Workers)> makeTable() {
  return {TarnReportingSessionWorkerClass::of<Workers>()...};
}

constexpr auto kAllWorkerClasses = makeTable<
    TarnReportingSessionTraceWorker, TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker,
    TarnReportingSessionSummaryWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionTallyWorker,
    TarnReportingSessionWattlogWorker, TarnReportingSessionMemoryLogWorker, TarnReportingSessionPylonWorker,
    TarnReportingSessionDriverSnapshotWorker, TarnReportingSessionSystemMonitorWorker, TarnReportingSessionSnareWorker,
    TarnReportingSessionDPWorker, TarnReportingSessionSummaryJsonFileWorker,
    TarnReportingSessionAudioRegistrationWorker, TarnReportingSessionRtcWorker, TarnReportingSessionTattleWorker>();

static_assert(std::all_of(kAllWorkerClasses.begin(), kAllWorkerClasses.end(), [](const auto& row) {
  return std::count_if(kAllWorkerClasses.begin(), kAllWorkerClasses.end(),
                       [&](const auto& other) { return other.name == row.name; }) == 1;
}));

}  // namespace

std::span<const TarnReportingSessionWorkerClass> TarnReportingWorkerClasses() {
  return kAllWorkerClasses;
}

}  // namespace tarn
