// SPDX-License-Identifier: Apache-2.0
// What happens to performance traces at their bounds and when the disk refuses.
#include <sys/resource.h>

#include <csignal>

#include "tests/host/traces/PerformanceTraceFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using platform::LogLevel;

class PerformanceTraceFault : public PerformanceTraceFixture {
 protected:
  // Stops it; the last callback.
  std::string stop(const Trace& trace) {
    trace.session->stopTrace();
    EXPECT_TRUE(testing::eventually([&] { return trace.delegate->calls().size() == 3; }));
    return trace.delegate->calls().back();
  }
};

TEST_F(PerformanceTraceFault, AFullFileSaysSoAndTheRestIsCounted) {
  PerformanceTraceLimits limits;
  limits.mostBytes = 6 * 1024;  // the end of a file takes 4 KiB of it
  make(limits);
  const Trace trace = startTrace();
  for (int i = 0; i < 100; ++i) {
    mark("again", i);
  }
  const std::string text = finish(trace);

  EXPECT_LE(text.size(), limits.mostBytes);
  const auto written = events(text, "tracePoint.again").size();
  EXPECT_GT(written, 0U);
  EXPECT_EQ(events(text, "tarnkit.traceFull").size(), 1U);
  const Json other = Json::parse(text).at("otherData");
  EXPECT_EQ(other.at("events"), written);
  EXPECT_EQ(other.at("eventsLeftOut"), 100 - written);
  EXPECT_EQ(other.at("full"), true);
  EXPECT_EQ(log_.entries(LogLevel::Error).size(), 1U);
  EXPECT_TRUE(log_.contains(LogLevel::Error, "performance trace trace-1 left out " + std::to_string(100 - written) +
                                                 " events: its file is full"));
}

// What a file adds by itself, such as a thread's name, was never an event of the trace.
TEST_F(PerformanceTraceFault, OnlyEventsOfTheTraceCountAsLeftOut) {
  TraceFile file({folder_.path("."), "trace.json", "trace-1", 2, false, 1, 0});  // no room at all
  ASSERT_TRUE(file.open().ok());
  file.writeCounter("memory", "bytes", 1, 1s);
  EXPECT_TRUE(file.isFull());
  EXPECT_EQ(file.leftOut(), 0U);
  file.write({{platform::SignpostCategory::TracePoint, "tracePoint", "again"}, 1s, -1ns, 1});
  EXPECT_EQ(file.leftOut(), 1U);
  file.writeLost(5, 1s);
  EXPECT_EQ(file.leftOut(), 6U);
}

TEST_F(PerformanceTraceFault, AFullBufferLosesWhatComesThenAndTheFileTells) {
  PerformanceTraceLimits limits;
  limits.mostBufferedEvents = 4;
  make(limits);
  const Trace trace = blockedTrace();
  for (int i = 0; i < 10; ++i) {
    mark("again", i);
  }
  release();
  ASSERT_TRUE(testing::eventually([&] { return readAll(partial()).find("eventsLost") != std::string::npos; }));
  mark("later");
  const std::string text = finish(trace);

  EXPECT_EQ(events(text, "tracePoint.again").size(), 4U);
  EXPECT_EQ(events(text, "tracePoint.later").size(), 1U);
  EXPECT_EQ(events(text, "tarnkit.eventsLost").at(0).at("args").at("count"), 6);
  EXPECT_EQ(Json::parse(text).at("otherData").at("eventsLeftOut"), 6);
  EXPECT_TRUE(log_.contains(
      LogLevel::Error, "performance trace trace-1 left out 6 events: they came faster than they could be written"));
}

TEST_F(PerformanceTraceFault, AHalfFullBufferIsEmptiedAtOnce) {
  PerformanceTraceLimits limits;
  limits.mostBufferedEvents = 8;
  limits.drainInterval = 1h;
  make(limits);
  const Trace trace = startTrace();
  for (int i = 0; i < 4; ++i) {
    mark("again", i);
  }
  EXPECT_TRUE(testing::eventually([&] { return readAll(partial()).find("again") != std::string::npos; }));
  EXPECT_EQ(events(finish(trace), "tracePoint.again").size(), 4U);
}

TEST_F(PerformanceTraceFault, AFolderThatCantBeMadeFailsTheStart) {
  folder_.write("DiagnosticLogs", "a file");
  const Trace trace = makeTrace();
  trace.session->startTrace();
  EXPECT_TRUE(trace.delegate->waitFor("start: Not a directory"));
  EXPECT_FALSE(trace.session->isValid());
  EXPECT_FALSE(signposts_.isRecording());
}

TEST_F(PerformanceTraceFault, NothingFollowsAFailedStart) {
  folder_.write("DiagnosticLogs", "a file");
  const Trace trace = makeTrace();
  trace.session->startTrace();
  trace.session->stopTrace();
  EXPECT_TRUE(trace.delegate->waitFor("start: Not a directory"));
  const Trace other = makeTrace();
  other.session->startTrace();
  EXPECT_TRUE(other.delegate->waitFor("start: Not a directory"));
  EXPECT_EQ(trace.delegate->calls().size(), 1U);
}

TEST_F(PerformanceTraceFault, AFullDiskIsAnErrorOfTheCompletion) {
  rlimit before{};
  ASSERT_EQ(::getrlimit(RLIMIT_FSIZE, &before), 0);
  const auto handler = std::signal(SIGXFSZ, SIG_IGN);
  const Trace trace = startTrace();
  const rlimit small{100, before.rlim_max};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &small), 0);
  mark("one");
  const bool isTold = testing::eventually([&] { return log_.contains(LogLevel::Error, "ends here"); });
  ::setrlimit(RLIMIT_FSIZE, &before);
  std::signal(SIGXFSZ, handler);
  EXPECT_TRUE(isTold);
  EXPECT_FALSE(signposts_.isRecording());
  EXPECT_TRUE(trace.session->isValid());

  EXPECT_EQ(stop(trace), "complete trace-1: File too large");
  EXPECT_EQ(trace.delegate->calls()[1], "stop");
  EXPECT_EQ(trace.delegate->location(), "");
  EXPECT_TRUE(files().empty());
  EXPECT_EQ(log_.entries(LogLevel::Error).size(), 1U);
}

TEST_F(PerformanceTraceFault, AFolderThatVanishesIsAnErrorOfTheCompletion) {
  const Trace trace = startTrace();
  std::filesystem::remove_all(traces());
  EXPECT_EQ(stop(trace), "complete trace-1: No such file or directory");
  EXPECT_EQ(trace.delegate->location(), "");
}

}  // namespace
}  // namespace tarn::linux_host
