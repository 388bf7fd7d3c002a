// SPDX-License-Identifier: Apache-2.0
// What a session's workers do is seen in the traces.
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;

class WorkerSignpost : public SessionFixture {
 protected:
  std::vector<std::string> takeNames() {
    std::vector<std::string> names;
    const auto intervals = platform_.signposts.intervals();
    for (; seen_ < intervals.size(); ++seen_) {
      names.push_back(intervals[seen_].name);
    }
    return names;
  }

 private:
  std::size_t seen_ = 0;
};

TEST_F(WorkerSignpost, CallsAreIntervalsOfTheirClass) {
  useWorkers<ConsumerWorker, ProducerWorker, EarlyWorker>();
  platform_.signposts.setRecording(true);
  const auto session = makeSession();

  session->start();
  EXPECT_EQ(takeNames(), (std::vector<std::string>{"ConsumerWorker.start", "ProducerWorker.start"}));

  session->sendMessage(message({{"tarnreporting_timestamp", now()}}));
  EXPECT_EQ(takeNames(), (std::vector<std::string>{"EarlyWorker.handleMessage", "ConsumerWorker.handleMessage",
                                                   "TarnReportingSession.sendMessage"}));

  session->stop();
  EXPECT_EQ(takeNames(), (std::vector<std::string>{"EarlyWorker.handleMessage", "ConsumerWorker.handleMessage",
                                                   "TarnReportingSession.sendMessage", "ProducerWorker.stop",
                                                   "ConsumerWorker.stop"}));
}

TEST_F(WorkerSignpost, NothingIsSetWhileNothingRecords) {
  useWorkers<ConsumerWorker, ProducerWorker>();
  const auto session = makeSession();
  session->start();
  session->sendMessage(message({{"tarnreporting_timestamp", now()}}));
  session->stop();
  EXPECT_EQ(platform_.signposts.begun(), 0U);
}

}  // namespace
}  // namespace tarn
