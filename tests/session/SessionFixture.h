// SPDX-License-Identifier: Apache-2.0
// A session on a platform of fakes, with a table of worker classes of the test's own.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "service/vocabulary/TarnReportingPlatform.h"
#include "session/TarnReportingSession.h"
#include "session/TarnReportingSessionMessage.h"
#include "session/TarnReportingSessionWorkerClass.h"
#include "testing/FakePlatform.h"

namespace tarn::testing {

// What the probing workers of a table did, in order: "Name verb".
inline std::vector<std::string>& trail() {
  static std::vector<std::string> entries;
  return entries;
}

// Makes the worker classes of a table behave; reset by the fixture.
struct WorkerScript {
  bool lateDeclines = false;                                           // whether LateWorker declines the session
  bool startsRefusing = false;                                         // whether RefusingWorker's start returns false
  std::vector<std::shared_ptr<TarnReportingSessionMessage>> received;  // by ConsumerWorker
};
inline WorkerScript& script() {
  static WorkerScript instance;
  return instance;
}

template <class Self>
class TrailWorker : public TarnReportingSessionWorkerProtocol {
 public:
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<Self> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    trail().push_back(std::string(Self::kClassName) + " init");
    return std::make_unique<Self>(session);
  }
  bool start() {
    trail().push_back(std::string(Self::kClassName) + " start");
    return true;
  }
  void stop() { trail().push_back(std::string(Self::kClassName) + " stop"); }
};

// Neither consumer nor producer.
class PlainWorker : public TrailWorker<PlainWorker> {
 public:
  static constexpr std::string_view kClassName = "PlainWorker";
  using TrailWorker::TrailWorker;
};

// Sends one derived message at stop.
class ProducerWorker : public TrailWorker<ProducerWorker>, public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "ProducerWorker";
  using TrailWorker::TrailWorker;
  void stop() {
    TrailWorker::stop();
    session()->sendMessage(
        std::make_shared<TarnReportingSessionMessage>(plist::Dictionary{{"derived", session()->messages().size()}},
                                                      AudioEventCategory::Generic, AudioEventType::Summary));
  }
};

class ConsumerWorker : public TrailWorker<ConsumerWorker>, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "ConsumerWorker";
  using TrailWorker::TrailWorker;
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>& message) override {
    trail().push_back("ConsumerWorker handle");
    script().received.push_back(message);
  }
};

// Starts on creation, without start and stop; wants redundant messages; runs in single-message sessions.
class EarlyWorker : public TarnReportingSessionWorkerProtocol, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "EarlyWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
  static std::unique_ptr<EarlyWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    trail().push_back("EarlyWorker init");
    return std::make_unique<EarlyWorker>(session);
  }
  static bool startOnInit() { return true; }
  static bool handleSingleMessageSession() { return true; }
  bool handleRedundantMessages() { return true; }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    trail().push_back("EarlyWorker handle");
  }
};

// Starts on creation, but declines the session while the script says so.
class LateWorker : public TrailWorker<LateWorker>, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "LateWorker";
  using TrailWorker::TrailWorker;
  static std::unique_ptr<LateWorker> initWithSession(const std::shared_ptr<TarnReportingSession>& session) {
    return script().lateDeclines ? nullptr : TrailWorker::initWithSession(session);
  }
  static bool startOnInit() { return true; }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    trail().push_back("LateWorker handle");
  }
};

class RefusingWorker : public TrailWorker<RefusingWorker>, public TarnReportingSessionWorkerConsumerProtocol {
 public:
  static constexpr std::string_view kClassName = "RefusingWorker";
  using TrailWorker::TrailWorker;
  bool start() {
    TrailWorker::start();
    return !script().startsRefusing;
  }
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    trail().push_back("RefusingWorker handle");
  }
};

// Producer and consumer at once.
class BothWorker : public TrailWorker<BothWorker>,
                   public TarnReportingSessionWorkerConsumerProtocol,
                   public TarnReportingSessionWorkerProducerProtocol {
 public:
  static constexpr std::string_view kClassName = "BothWorker";
  using TrailWorker::TrailWorker;
  void handleMessage(const std::shared_ptr<TarnReportingSessionMessage>&) override {
    trail().push_back("BothWorker handle");
  }
};

// Lacks initWithSession.
class UnmakeableWorker : public TarnReportingSessionWorkerProtocol {
 public:
  static constexpr std::string_view kClassName = "UnmakeableWorker";
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;
};

class SessionFixture : public ::testing::Test {
 protected:
  SessionFixture() {
    trail().clear();
    script() = {};
    useWorkers({});
  }
  ~SessionFixture() override { script() = {}; }

  void useWorkers(std::vector<TarnReportingSessionWorkerClass> table) {
    table_ = std::move(table);
    TarnReportingSession::setAllWorkerClasses(table_);
  }
  template <class... Workers>
  void useWorkers() {
    useWorkers({TarnReportingSessionWorkerClass::of<Workers>()...});
  }
  // Another installation of the same platform and workers: what the process shares begins afresh.
  void installAnew() {
    TarnReportingInstallFacilities(&platform_.facilities());
    TarnReportingSession::setAllWorkerClasses(table_);
  }

  static std::shared_ptr<TarnReportingSession> makeSession(
      std::int64_t reporterID = 7, TarnReportingSession::Mode mode = TarnReportingSession::Mode::Ordinary) {
    return TarnReportingSession::initWithID(reporterID, {4711}, mode);
  }
  static std::shared_ptr<TarnReportingSessionMessage> message(
      plist::Dictionary payload, AudioEventCategory category = AudioEventCategory::Playback,
      AudioEventType type = AudioEventType::Start) {
    return std::make_shared<TarnReportingSessionMessage>(std::move(payload), category, type);
  }
  // A time stamp that the intake leaves alone.
  double now() const { return platform_.clock.epochSeconds(); }

  FakePlatform platform_;

 private:
  std::vector<TarnReportingSessionWorkerClass> table_;
};

}  // namespace tarn::testing
