// SPDX-License-Identifier: Apache-2.0
// The trace points that a client's requests set: which, in which order, with which argument.
#include "tests/service/ServiceFixture.h"

namespace tarn {
namespace {

using namespace testing;

class OperationTracePoints : public ServiceFixture {
 protected:
  using Points = std::vector<FakeTracePoints::Point>;

  OperationTracePoints() : client_(connect(41)) { platform_.tracePoints.clear(); }

  // What was emitted since the last call.
  Points take() {
    Points points = platform_.tracePoints.emitted();
    platform_.tracePoints.clear();
    return points;
  }

  const Client client_;
  Answer<bool> held_;
};

TEST_F(OperationTracePoints, CreateIsMarkedBeforeTheSessionThatItMakes) {
  create(client_, -7);
  EXPECT_EQ(take(), (Points{{0x21044814, -7}, {0x21044828, -7}}));
}

TEST_F(OperationTracePoints, CreatingAnewMarksTheEndOfTheSessionThatIsReplaced) {
  create(client_, 10);
  take();
  create(client_, 10);
  EXPECT_EQ(take(), (Points{{0x21044814, 10}, {0x21044828, 10}, {0x21044834, 10}}));
}

TEST_F(OperationTracePoints, ChangeOfTypeMarksTheTwoSessionsAlone) {
  create(client_, 10);
  take();
  retype(client_, 1, 10);
  EXPECT_EQ(take(), (Points{{0x21044828, 10}, {0x21044834, 10}}));
  retype(client_, 1, 10);
  EXPECT_EQ(take(), Points{});
}

TEST_F(OperationTracePoints, StartIsMarkedBeforeTheSessionStarts) {
  create(client_, 10);
  take();
  start(client_, 10, held_);
  EXPECT_EQ(take(), (Points{{0x21044818, 10}, {0x2104482C, 10}}));
  start(client_, 10, held_);  // nothing starts, yet the request is carried out
  start(client_, 0, held_);
  start(client_, 99, held_);
  EXPECT_EQ(take(), (Points{{0x21044818, 10}, {0x21044818, 0}, {0x21044818, 99}}));
}

TEST_F(OperationTracePoints, MessageIsMarkedWithTheClientsProcessThenInEachSession) {
  create(client_, 10);
  create(client_, 11);
  take();
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{11, 10});
  EXPECT_EQ(take(), (Points{{0x21044824, 41}, {0x21044838, 11}, {0x21044838, 10}}));
}

TEST_F(OperationTracePoints, RefusedMessageIsMarkedAllTheSame) {
  service_->setReportingEnabled(false);
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});
  EXPECT_EQ(take(), (Points{{0x21044824, 41}}));
}

TEST_F(OperationTracePoints, StopIsMarkedBeforeTheSessionStopsAndThatBeforeItsSummary) {
  create(client_, 10);
  start(client_, 10, held_);
  take();
  stop(client_, 10);
  const Points points = take();
  ASSERT_GE(points.size(), 3U);
  EXPECT_EQ(points[0], (FakeTracePoints::Point{0x2104481C, 10}));
  EXPECT_EQ(points[1], (FakeTracePoints::Point{0x21044830, 10}));
  for (std::size_t i = 2; i < points.size(); ++i) {  // what the producers send at the stop
    EXPECT_EQ(points[i], (FakeTracePoints::Point{0x21044838, 10}));
  }
  stop(client_, 10);
  stop(client_, 0);
  EXPECT_EQ(take(), (Points{{0x2104481C, 10}, {0x2104481C, 0}}));
}

TEST_F(OperationTracePoints, EachIsMarkedAfterTheLineThatTellsOfTheRequest) {
  std::vector<std::string> told;
  platform_.tracePoints.onEmit([&] { told.push_back(platform_.log.messages().back()); });
  const auto takeFirst = [&] { return std::exchange(told, {}).at(0); };
  create(client_, 10);
  EXPECT_EQ(takeFirst(), "creating session for reporter 10");
  start(client_, 10, held_);
  EXPECT_EQ(takeFirst(), "starting session for reporter 10");
  send(client_, {{"a", 1}}, std::vector<std::int64_t>{10});
  EXPECT_EQ(takeFirst(), "sending message for reporter (10)");
  stop(client_, 10);
  EXPECT_EQ(takeFirst(), "stopping session for reporter 10");
  platform_.tracePoints.onEmit({});
}

TEST_F(OperationTracePoints, OtherOperationsSetNone) {
  create(client_, 10);
  take();
  configure(client_, {{"a", 1}}, 10);
  serviceType(client_, 10);
  Answer<plist::Dictionary> reporter;
  client_.remote().reporterID(10, reporter.reply());
  Answer<std::vector<std::int64_t>> all;
  client_.remote().getAllReporters(all.reply());
  platform_.runUntilIdle();
  EXPECT_EQ(take(), Points{});
}

TEST_F(OperationTracePoints, DestroyMarksTheEndOfTheSessionAlone) {
  create(client_, 10);
  take();
  destroy(client_, 10);
  EXPECT_EQ(take(), (Points{{0x21044834, 10}}));
}

}  // namespace
}  // namespace tarn
