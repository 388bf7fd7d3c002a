// SPDX-License-Identifier: Apache-2.0
#include <unistd.h>

#include <regex>

#include "tests/host/traces/PerformanceTraceFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using testing::eventually;

class PerformanceTrace : public PerformanceTraceFixture {
 protected:
  // The text with what differs between runs and processes made equal.
  static std::string normalised(std::string text) {
    const std::string process = std::to_string(::getpid());
    text = std::regex_replace(text, std::regex("\"(pid|tid)\":" + process), "\"$1\":1");
    return std::regex_replace(
        text, std::regex("(\"name\":\"(?:process|thread)_name\",\"args\":\\{\"name\":)\"[^\"]*\""), "$1\"tests\"");
  }
};

TEST_F(PerformanceTrace, RunsFromStartToCompletionOnAThreadOfItsOwn) {
  const Trace trace = startTrace();
  finish(trace);

  EXPECT_EQ(trace.delegate->calls(), (Strings{"start", "stop", "complete trace-1"}));
  const auto threads = trace.delegate->threads();
  EXPECT_NE(threads[0], std::this_thread::get_id());
  EXPECT_EQ(threads, std::vector<std::thread::id>(3, threads[0]));
  EXPECT_TRUE(std::filesystem::path(trace.delegate->location()).is_absolute());
  EXPECT_EQ(files(), Strings{std::filesystem::path(trace.delegate->location()).filename().string()});
}

TEST_F(PerformanceTrace, TheFileHasItsExactForm) {
  clock_.setMonotonic(5s);
  const Trace trace = startTrace();
  interval("handleMessage", 1234567ns, {"reporterID", 7});
  mark("session_message", 7);
  EXPECT_EQ(normalised(finish(trace)),
            R"({"traceEvents":[
{"ph":"M","pid":1,"name":"process_name","args":{"name":"tests"}},
{"ph":"M","pid":1,"tid":1,"name":"thread_name","args":{"name":"tests"}},
{"ph":"X","pid":1,"tid":1,"ts":5000000.000,"dur":1234.567,"cat":"sys.oxbow.tarnkit,worker","name":"Worker.handleMessage"},
{"ph":"i","pid":1,"tid":1,"ts":5001234.567,"s":"t","cat":"sys.oxbow.tarnkit,tracePoint","name":"tracePoint.session_message"}
],
"displayTimeUnit":"ns",
"otherData":{"token":"trace-1","template":2,"beganEpochSeconds":1750000000.0,"events":2,"eventsLeftOut":0,"full":false}}
)");
}

TEST_F(PerformanceTrace, TheNameTellsTheMomentTheProcessAndTheNumber) {
  const Trace trace = startTrace();
  finish(trace);
  EXPECT_EQ(std::filesystem::path(trace.delegate->location()).filename(),
            "20250615-150640Z-tarnkit-" + std::to_string(::getpid()) + "-1.json");
}

TEST_F(PerformanceTrace, TheSwitchIsOnOnlyWhileATraceRecords) {
  EXPECT_FALSE(signposts_.isRecording());
  const Trace trace = startTrace();
  EXPECT_TRUE(signposts_.isRecording());
  finish(trace);
  EXPECT_FALSE(signposts_.isRecording());
}

TEST_F(PerformanceTrace, TheProfileTemplateAddsArgumentsAndLoad) {
  clock_.setProcessorTicks(1500);
  processFacts_.setPhysicalFootprint(4096);
  const Trace trace = startTrace(3);
  interval("stop", 1us, {"reporterID", -7});
  mark("session_message", 9);
  const std::string text = finish(trace);

  EXPECT_EQ(events(text, "Worker.stop").at(0).at("args"), Json::parse(R"({"reporterID": -7})"));
  EXPECT_EQ(events(text, "tracePoint.session_message").at(0).at("args"), Json::parse(R"({"argument": 9})"));
  ASSERT_FALSE(events(text, "processor time").empty());
  EXPECT_EQ(events(text, "processor time")[0].at("ph"), "C");
  EXPECT_EQ(events(text, "processor time")[0].at("args"), Json::parse(R"({"microseconds": 1500})"));
  EXPECT_EQ(events(text, "memory").at(0).at("args"), Json::parse(R"({"bytes": 4096})"));
  EXPECT_EQ(Json::parse(text).at("otherData").at("template"), 3);
}

TEST_F(PerformanceTrace, ALoadThatCantBeToldIsLeftOut) {
  processFacts_.failPhysicalFootprint("hidden");
  const Trace trace = startTrace(3);
  EXPECT_TRUE(events(finish(trace), "memory").empty());
}

TEST_F(PerformanceTrace, OtherTemplatesAreRefused) {
  EXPECT_EQ(service().createSession({1, false}), nullptr);
  EXPECT_EQ(service().createSession({4, false}), nullptr);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "there is no performance trace template 4"));
}

TEST_F(PerformanceTrace, CompressionIsRefused) {
  EXPECT_EQ(service().createSession({2, true}), nullptr);
  EXPECT_TRUE(log_.contains(platform::LogLevel::Error, "performance traces are not compressed here"));
}

TEST_F(PerformanceTrace, IsValidFromTheStartToTheStop) {
  const Trace trace = makeTrace();
  EXPECT_FALSE(trace.session->isValid());
  trace.session->startTrace();
  EXPECT_TRUE(trace.session->isValid());
  EXPECT_TRUE(trace.delegate->waitFor("start"));
  EXPECT_TRUE(trace.session->isValid());
  finish(trace);
  EXPECT_FALSE(trace.session->isValid());
}

TEST_F(PerformanceTrace, AStopRightBehindTheStartGivesAWholeTrace) {
  const Trace trace = makeTrace();
  trace.session->startTrace();
  EXPECT_TRUE(Json::accept(finish(trace)));
  EXPECT_EQ(trace.delegate->calls(), (Strings{"start", "stop", "complete trace-1"}));
}

TEST_F(PerformanceTrace, FurtherStartsAndStopsDoNothing) {
  const Trace trace = makeTrace();
  trace.session->stopTrace();  // nothing to be stopped yet
  trace.session->startTrace();
  trace.session->startTrace();
  finish(trace);
  trace.session->stopTrace();
  trace.session->startTrace();
  const Trace other = startTrace();  // after whatever those might have posted
  EXPECT_EQ(trace.delegate->calls(), (Strings{"start", "stop", "complete trace-1"}));
}

TEST_F(PerformanceTrace, AnIntervalThatBeganEarlierIsLeftOut) {
  const auto began = clock_.monotonic();
  clock_.advance(1ms);
  const Trace trace = startTrace();
  clock_.advance(1ms);
  signposts_.end({platform::SignpostCategory::Worker, "Worker", "early"}, began);
  interval("late", 1ms);
  const std::string text = finish(trace);
  EXPECT_TRUE(events(text, "Worker.early").empty());
  EXPECT_EQ(events(text, "Worker.late").size(), 1U);
}

TEST_F(PerformanceTrace, EveryThreadHasItsName) {
  const Trace trace = startTrace();
  std::thread([&] {
    ::pthread_setname_np(::pthread_self(), "speaker");
    mark("from_there");
    // The name is asked for while the thread is still there.
    EXPECT_TRUE(eventually([&] { return readAll(partial()).find("from_there") != std::string::npos; }));
  }).join();
  const std::string text = finish(trace);
  bool isNamed = false;
  for (const Json& event : events(text, "thread_name")) {
    isNamed |= event.at("args").at("name") == "speaker" &&
               event.at("tid") == events(text, "tracePoint.from_there").at(0).at("tid");
  }
  EXPECT_TRUE(isNamed);
}

TEST_F(PerformanceTrace, SeveralTracesHaveAFileEach) {
  const Trace first = startTrace();
  mark("one");
  const Trace second = startTrace();
  mark("two");
  const std::string firstText = finish(first);
  mark("three");
  const std::string secondText = finish(second);
  EXPECT_NE(first.delegate->location(), second.delegate->location());
  EXPECT_EQ(Json::parse(firstText).at("otherData").at("events"), 2);
  EXPECT_EQ(Json::parse(secondText).at("otherData").at("events"), 2);
  EXPECT_TRUE(events(secondText, "tracePoint.one").empty());
}

TEST_F(PerformanceTrace, OneTooManyIsRefusedUntilAnotherEnds) {
  PerformanceTraceLimits limits;
  limits.mostTraces = 2;
  make(limits);
  const Trace first = startTrace();
  const Trace second = startTrace();
  const Trace third = makeTrace();
  third.session->startTrace();
  ASSERT_TRUE(third.delegate->waitFor("start: as many traces as may be record already"));
  EXPECT_FALSE(third.session->isValid());
  third.session->stopTrace();
  finish(first);
  const Trace fourth = startTrace();
  EXPECT_EQ(third.delegate->calls().size(), 1U);
}

TEST_F(PerformanceTrace, ASessionThatIsLetGoOfEndsWithoutCallbacksAndLeavesNothing) {
  Trace trace = startTrace();
  mark("one");
  trace.session.reset();
  EXPECT_FALSE(signposts_.isRecording());
  EXPECT_TRUE(eventually([&] { return files().empty(); }));
  EXPECT_EQ(trace.delegate->calls(), Strings{"start"});
}

TEST_F(PerformanceTrace, ASessionThatIsLetGoOfBeforeItsStartMakesNoCallback) {
  const Trace blocker = blockedTrace();
  Trace trace = makeTrace();
  trace.session->startTrace();
  trace.session.reset();
  release();
  finish(blocker);
  EXPECT_TRUE(trace.delegate->calls().empty());
  EXPECT_EQ(files().size(), 1U);
}

TEST_F(PerformanceTrace, ACallbackMayLetGoOfTheSession) {
  Trace trace = makeTrace();
  trace.delegate->also = [&](const std::string& call) {
    if (call.starts_with("complete")) {
      trace.session->setDelegate({});
      trace.session.reset();
    }
  };
  trace.session->startTrace();
  trace.session->stopTrace();
  EXPECT_TRUE(trace.delegate->waitFor("complete trace-1"));
  const Trace next = startTrace();
  EXPECT_EQ(trace.delegate->calls().size(), 3U);
}

TEST_F(PerformanceTrace, ADelegateThatIsGoneIsNotCalled) {
  Trace trace = makeTrace();
  trace.delegate.reset();
  trace.session->startTrace();
  trace.session->stopTrace();
  EXPECT_TRUE(eventually([&] { return files().size() == 1 && files()[0].ends_with(".json"); }));
}

TEST_F(PerformanceTrace, AShutdownRemovesHalfFilesAndSessionsOutliveIt) {
  const Trace trace = startTrace();
  service_->shutdown();
  EXPECT_TRUE(files().empty());
  EXPECT_FALSE(signposts_.isRecording());
  EXPECT_EQ(service_->createSession({2, false}), nullptr);
  service_.reset();
  trace.session->stopTrace();
  EXPECT_EQ(trace.delegate->calls(), Strings{"start"});
}

}  // namespace
}  // namespace tarn::linux_host
