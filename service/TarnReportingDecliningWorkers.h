// Worker classes that apply to no session of this build: their back-ends aren't there, so each declines every session.
// They keep the table of worker classes whole: its order, what each class is and what it can do.
#pragma once

#include <memory>
#include <string_view>

#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// The common part: never made, so the consumer's operation is never called.
template <class Self>
class TarnReportingDecliningWorker : public TarnReportingSessionWorkerProtocol {
 public:
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<Self> initWithSession(const std::shared_ptr<TarnReportingSession>&) { return nullptr; }
};

template <class Self>
class TarnReportingDecliningConsumer : public TarnReportingDecliningWorker<Self>,
                                       public TarnReportingSessionWorkerConsumerProtocol {
 public:
  using TarnReportingDecliningWorker<Self>::TarnReportingDecliningWorker;
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {}
};

template <class Self>
class TarnReportingDecliningProducer : public TarnReportingDecliningWorker<Self>,
                                       public TarnReportingSessionWorkerProducerProtocol {
 public:
  using TarnReportingDecliningWorker<Self>::TarnReportingDecliningWorker;
};

class TarnReportingSessionDriverSnapshotWorker
    : public TarnReportingDecliningProducer<TarnReportingSessionDriverSnapshotWorker> {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionDriverSnapshotWorker";
};

}  // namespace tarn
