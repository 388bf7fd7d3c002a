// SPDX-License-Identifier: Apache-2.0
// The whole service front with the real table of worker classes, on a platform of fakes.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plist/Dictionary.h"
#include "service/TarnReportingClientServerInstance.h"
#include "service/TarnReportingService.h"
#include "service/TarnReportingWorkerClasses.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSession.h"
#include "testing/FakePlatform.h"

namespace tarn::testing {

// What a reply brought; `count` tells how often it came.
template <class Result>
struct Answer {
  int count = 0;
  std::optional<platform::RemoteError> error;
  Result result{};

  auto reply() {
    return [this](const std::optional<platform::RemoteError>& theError, Result theResult) {
      ++count;
      error = theError;
      result = std::move(theResult);
    };
  }
};

class ServiceFixture : public ::testing::Test {
 protected:
  ServiceFixture() {
    TarnReportingSession::setAllWorkerClasses(TarnReportingWorkerClasses());
    service_ = TarnReportingService::create();
    platform_.listener.setDelegate(service_);
    platform_.listener.resume();
  }
  ~ServiceFixture() override {
    for (const auto& connection : platform_.listener.connections()) {
      connection->invalidate();
    }
    platform_.workQueues.dropAll();
    service_.reset();
  }

  // A connected client process.
  struct Client {
    std::shared_ptr<FakeConnection> connection;
    platform::TarnReportingServiceProtocol& remote() const { return *connection->exportedObject(); }
  };
  Client connect(std::int32_t processIdentifier, std::optional<std::string> name = "player") {
    if (name) {
      platform_.processFacts.setProcessName(processIdentifier, *name);
    }
    Client client{platform_.listener.connect(processIdentifier)};
    platform_.runUntilIdle();
    return client;
  }

  // The operations, run to their end. `held` gets the reply of a start whenever it comes.
  void create(const Client& client, std::int64_t reporterID) {
    Answer<bool> answer;
    client.remote().createReportingSession(reporterID, answer.reply());
    expectDone(answer);
  }
  void retype(const Client& client, std::uint16_t type, std::int64_t reporterID) {
    Answer<bool> answer;
    client.remote().setServiceType(type, reporterID, answer.reply());
    expectDone(answer);
  }
  void configure(const Client& client, plist::Dictionary configuration, std::int64_t reporterID) {
    Answer<bool> answer;
    client.remote().setConfiguration(std::move(configuration), reporterID, answer.reply());
    expectDone(answer);
  }
  void start(const Client& client, std::int64_t reporterID, Answer<bool>& held) {
    client.remote().startReportingSessionForID(reporterID, held.reply());
    platform_.runUntilIdle();
  }
  void stop(const Client& client, std::int64_t reporterID) {
    Answer<bool> answer;
    client.remote().stopReportingSessionForID(reporterID, answer.reply());
    expectDone(answer);
  }
  void destroy(const Client& client, std::int64_t reporterID) {
    Answer<bool> answer;
    client.remote().destroyReportingSession(reporterID, answer.reply());
    expectDone(answer);
  }
  std::uint16_t serviceType(const Client& client, std::int64_t reporterID) {
    Answer<std::uint16_t> answer;
    client.remote().getServiceNameForReporterID(reporterID, answer.reply());
    platform_.runUntilIdle();
    EXPECT_EQ(answer.count, 1);
    return answer.result;
  }
  // The error of the reply, if it had one.
  std::optional<platform::RemoteError> send(const Client& client, plist::Dictionary message,
                                            platform::ReporterIDs reporterIDs) {
    int count = 0;
    std::optional<platform::RemoteError> received;
    client.remote().sendMessage(std::move(message), 4, 1, std::move(reporterIDs),
                                [&](const std::optional<platform::RemoteError>& error) {
                                  ++count;
                                  received = error;
                                });
    platform_.runUntilIdle();
    EXPECT_EQ(count, 1);
    return received;
  }
  std::shared_ptr<TarnReportingSession> sessionOf(std::size_t client, std::int64_t reporterID) const {
    return service_->getAllClients().at(client)->clientReportingSessionMap().find(reporterID);
  }
  // The lines of a log category since the log was last cleared: "level text".
  std::vector<std::string> lines(std::string_view category) const {
    static constexpr const char* kLevels[] = {"debug ", "info ", "default ", "error "};
    std::vector<std::string> found;
    for (const auto& entry : platform_.log.entries()) {
      if (entry.category == category) {
        found.push_back(kLevels[static_cast<std::size_t>(entry.level)] + entry.message());
      }
    }
    return found;
  }
  // How many events of this name the analytics service got.
  std::size_t events(std::string_view name) const { return platform_.tally.payloads(name).size(); }

  FakePlatform platform_;
  std::shared_ptr<TarnReportingService> service_;

 private:
  void expectDone(const Answer<bool>& answer) {
    platform_.runUntilIdle();
    EXPECT_EQ(answer.count, 1);
    EXPECT_FALSE(answer.error);
    EXPECT_TRUE(answer.result);
  }
};

}  // namespace tarn::testing
