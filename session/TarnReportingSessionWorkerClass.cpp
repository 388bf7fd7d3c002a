// SPDX-License-Identifier: Apache-2.0
#include "session/TarnReportingSessionWorkerClass.h"

#include "service/vocabulary/TarnReportingLog.h"

namespace tarn {

namespace {

constexpr TarnReportingLogger kLog{TarnReportingSessionCategory, "TarnReportingSession"};

}  // namespace

TarnReportingSessionWorkerClasses::TarnReportingSessionWorkerClasses(
    std::span<const TarnReportingSessionWorkerClass> table) {
  for (const TarnReportingSessionWorkerClass& row : table) {
    if (row.initWithSession == nullptr) {
      kLog(LogLevel::Debug, "Worker does not implement initWithSession! %@", row.name);
      continue;
    }
    initializableWorkerClasses.push_back(&row);
    if (row.asConsumer != nullptr) {
      consumerWorkerClasses.push_back(&row);
    }
    if (row.isProducer) {
      producerWorkerClasses.push_back(&row);
    }
    if (row.startOnInit != nullptr && row.startOnInit()) {
      startOnInitWorkerClasses.push_back(&row);
    }
  }
}

}  // namespace tarn
