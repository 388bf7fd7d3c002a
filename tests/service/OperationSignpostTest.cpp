// SPDX-License-Identifier: Apache-2.0
// Every remote operation is an interval of the traces, and so is the work that it has done.
#include <algorithm>

#include "tests/service/ServiceFixture.h"

namespace tarn::testing {
namespace {

class OperationSignpost : public ServiceFixture {
 protected:
  OperationSignpost() { platform_.signposts.setRecording(true); }

  std::size_t operations(const std::string& name) const {
    return platform_.signposts.count("TarnReportingClientServerInstance." + name);
  }
};

TEST_F(OperationSignpost, EachOperationIsOneInterval) {
  const Client client = connect(41);
  create(client, 7);
  retype(client, 1, 7);
  configure(client, {{"HostApplicationDisplayID", "player"}}, 7);
  Answer<bool> held;
  start(client, 7, held);
  EXPECT_FALSE(send(client, {{"a", 1}}, platform::ReporterIDs(std::vector<std::int64_t>{7})));
  serviceType(client, 7);
  stop(client, 7);
  destroy(client, 7);
  Answer<plist::Dictionary> reporter;
  client.remote().reporterID(7, reporter.reply());
  Answer<std::vector<std::int64_t>> all;
  client.remote().getAllReporters(all.reply());
  client.remote().killService();
  platform_.runUntilIdle();

  const std::pair<std::string, std::string> expected[] = {{"createReportingSession", "reporterID=7"},
                                                          {"setServiceType", "reporterID=7"},
                                                          {"setConfiguration", "reporterID=7"},
                                                          {"startReportingSessionForID", "reporterID=7"},
                                                          {"sendMessage", "category=4"},
                                                          {"getServiceNameForReporterID", "reporterID=7"},
                                                          {"stopReportingSessionForID", "reporterID=7"},
                                                          {"destroyReportingSession", "reporterID=7"},
                                                          {"reporterID", "reporterID=7"},
                                                          {"getAllReporters", ""},
                                                          {"killService", ""}};
  const auto intervals = platform_.signposts.intervals();
  for (const auto& [name, argument] : expected) {
    EXPECT_EQ(operations(name), 1U) << name;
    const FakeSignposts::Post post{platform::SignpostCategory::Operation, "TarnReportingClientServerInstance." + name,
                                   argument};
    EXPECT_EQ(std::count(intervals.begin(), intervals.end(), post), 1) << name;
  }
}

TEST_F(OperationSignpost, TheEndOfAClientIsOneInterval) {
  const Client client = connect(41);
  client.connection->interrupt();
  platform_.runUntilIdle();
  EXPECT_EQ(operations("handleConnectionError"), 1U);
}

TEST_F(OperationSignpost, AMessageIsSeenOnItsWholeRoad) {
  const Client client = connect(41);
  create(client, 7);
  Answer<bool> held;
  start(client, 7, held);
  EXPECT_FALSE(send(client, {{"a", 1}}, platform::ReporterIDs(std::vector<std::int64_t>{7})));

  const auto intervals = platform_.signposts.intervals();
  const auto place = [&](const FakeSignposts::Post& post) {
    return std::find(intervals.begin(), intervals.end(), post) - intervals.begin();
  };
  const auto worker =
      place({platform::SignpostCategory::Worker, "TarnReportingSessionTallyWorker.handleMessage", "reporterID=7"});
  const auto intake = place({platform::SignpostCategory::Message, "TarnReportingSession.sendMessage", "reporterID=7"});
  const auto operation =
      place({platform::SignpostCategory::Operation, "TarnReportingClientServerInstance.sendMessage", "category=4"});
  EXPECT_LT(worker, intake);
  EXPECT_LT(intake, operation);
  EXPECT_LT(operation, std::ssize(intervals));
}

}  // namespace
}  // namespace tarn::testing
