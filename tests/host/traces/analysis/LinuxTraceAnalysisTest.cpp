// SPDX-License-Identifier: Apache-2.0
// The library as the service sees it: loaded, looked through for its classes and asked about real traces.
#include "host/traces/LinuxTraceAnalysis.h"

#include <cerrno>

#include "tests/host/traces/PerformanceTraceFixture.h"

namespace tarn::linux_host {
namespace {

using namespace std::chrono_literals;
using platform::LogLevel;

class TraceAnalysis : public PerformanceTraceFixture {
 protected:
  std::shared_ptr<platform::TraceAnalysisLibrary> library() {
    auto loaded = analysis_.load();
    EXPECT_EQ(loaded.missingClass, "");
    EXPECT_NE(loaded.library, nullptr);
    return loaded.library;
  }
  // The model of a trace with that text.
  std::shared_ptr<platform::TraceModel> open(const std::string& text) {
    folder_.write("trace.json", text);
    auto opened = library()->openTrace(folder_.path("trace.json"));
    EXPECT_FALSE(opened.failed());
    return opened.value;
  }
  // Which class a library lacks.
  std::string missing(const std::string& path) {
    const auto loaded = LinuxTraceAnalysis(path, log_).load();
    EXPECT_EQ(loaded.library, nullptr);
    return loaded.missingClass;
  }

  LinuxTraceAnalysis analysis_{TARN_TRACE_ANALYSIS, log_};
};

TEST_F(TraceAnalysis, TellsTheIntervalsOfATraceOfOurs) {
  const Trace trace = startTrace(3);
  const auto outer = signposts_.begin();
  interval("handleMessage", 1500us, {"reporterID", 7});
  mark("session_message");
  signposts_.end({platform::SignpostCategory::Operation, "Client", "sendMessage"}, outer);
  finish(trace);

  const auto opened = library()->openTrace(trace.delegate->location());
  ASSERT_FALSE(opened.failed());
  const auto intervals = opened.value->allSignpostIntervals();
  ASSERT_FALSE(intervals.failed());
  ASSERT_EQ(intervals.value.size(), 2U);
  EXPECT_EQ(intervals.value[0].name, "Worker.handleMessage");
  EXPECT_EQ(intervals.value[0].subsystem, "sys.oxbow.tarnkit");
  EXPECT_DOUBLE_EQ(intervals.value[0].durationSeconds, 0.0015);
  EXPECT_EQ(intervals.value[1].name, "Client.sendMessage");
}

TEST_F(TraceAnalysis, MakesTheProbesThatAreDescribed) {
  const auto model = open(R"({"traceEvents":[{"ph":"X","ts":1,"dur":250,"cat":"sys.oxbow.audio","name":"a"},
                                             {"ph":"X","ts":2,"dur":500,"cat":"other","name":"b"}]})");
  plist::Array children;
  children.append(plist::Dictionary{{"name", "Inner"}, {"signpost", "b"}, {"subsystem", "o*"}});
  const plist::Dictionary group{{"name", "Group"}, {"children", children}};
  const plist::Dictionary all{{"name", "All"}, {"type", "SkeinSignpostIntervalProbe"}};
  const auto probes = library()->probesForDictionaries({group, plist::Dictionary{{"none", 1}}, all}, *model);

  ASSERT_EQ(probes.size(), 2U);
  EXPECT_EQ(probes[0].name, "Group");
  EXPECT_EQ(probes[0].kind, "SkeinProbe");
  EXPECT_FALSE(probes[0].measuresSignpostIntervals);
  ASSERT_EQ(probes[0].children.size(), 1U);
  EXPECT_EQ(probes[0].children[0].kind, "SkeinSignpostIntervalProbe");
  ASSERT_EQ(probes[0].children[0].events.size(), 1U);
  EXPECT_EQ(probes[0].children[0].events[0].name, "b");
  EXPECT_DOUBLE_EQ(probes[0].children[0].events[0].durationSeconds, 0.0005);
  EXPECT_TRUE(probes[1].measuresSignpostIntervals);
  EXPECT_EQ(probes[1].events.size(), 2U);
}

TEST_F(TraceAnalysis, ADescriptionThatJsonCantHoldIsSkippedAndLogged) {
  const auto model = open(R"({"traceEvents":[]})");
  const plist::Dictionary odd{{"name", "odd"}, {"number", std::numeric_limits<double>::infinity()}};
  const auto probes = library()->probesForDictionaries({odd, plist::Dictionary{{"name", "good"}}}, *model);
  EXPECT_EQ(probes.size(), 1U);
  EXPECT_TRUE(log_.contains(LogLevel::Error, "a probe's description holds what no probe can have"));
}

TEST_F(TraceAnalysis, MoreProbesThanThereMayBeAreNone) {
  const auto model = open(R"({"traceEvents":[]})");
  const std::vector<plist::Dictionary> many(257, plist::Dictionary{{"name", "a"}});
  EXPECT_TRUE(library()->probesForDictionaries(many, *model).empty());
  EXPECT_TRUE(
      log_.contains(LogLevel::Error, "the trace-analysis library gives no probes: there are more than 256 probes"));
}

TEST_F(TraceAnalysis, TracesThatCantBeReadAreErrors) {
  EXPECT_EQ(library()->openTrace(folder_.path("absent")).error->code, ENOENT);
  EXPECT_EQ(library()->openTrace("").error->code, ENOENT);
  folder_.write("broken", "{\"traceEvents\":[");
  const auto opened = library()->openTrace(folder_.path("broken"));
  ASSERT_TRUE(opened.failed());
  EXPECT_EQ(opened.value, nullptr);
  EXPECT_EQ(opened.error->text, "it is no whole JSON text: at byte 17");
}

TEST_F(TraceAnalysis, IsLoadedOnce) {
  EXPECT_EQ(analysis_.load().library, analysis_.load().library);
  LinuxTraceAnalysis absent(folder_.path("absent.so"), log_);
  EXPECT_EQ(absent.load().missingClass, "SkeinTraceModel");
  EXPECT_EQ(absent.load().missingClass, "SkeinTraceModel");
  EXPECT_EQ(log_.entries(LogLevel::Error).size(), 1U);
}

TEST_F(TraceAnalysis, ALibraryThatCantBeLoadedLacksItsFirstClass) {
  EXPECT_EQ(missing(folder_.path("absent.so")), "SkeinTraceModel");
  folder_.write("no library.so", "text");
  EXPECT_EQ(missing(folder_.path("no library.so")), "SkeinTraceModel");
  EXPECT_EQ(missing(folder_.path()), "SkeinTraceModel");
  EXPECT_TRUE(log_.contains(LogLevel::Error, "the trace-analysis library can't be loaded: "));
}

TEST_F(TraceAnalysis, TheFirstClassThatALibraryLacksIsTold) {
  EXPECT_EQ(missing(TARN_TRACE_ANALYSIS_LACKING), "SkeinSignpostPlist");
  EXPECT_TRUE(log_.contains(LogLevel::Error, " lacks a class: SkeinSignpostPlist"));
}

TEST_F(TraceAnalysis, AnotherLibraryLacksEveryClass) {
  EXPECT_EQ(missing("libm.so.6"), "SkeinTraceModel");
  EXPECT_TRUE(log_.contains(LogLevel::Error, "the trace-analysis library libm.so.6 lacks a class: SkeinTraceModel"));
}

TEST_F(TraceAnalysis, ATraceOfAnotherLibraryHasNoProbes) {
  class Stranger final : public platform::TraceModel {
   public:
    Result<std::vector<platform::SignpostInterval>> allSignpostIntervals() override { return {}; }
  } stranger;
  EXPECT_TRUE(library()->probesForDictionaries({plist::Dictionary{{"name", "a"}}}, stranger).empty());
}

TEST_F(TraceAnalysis, TheDefaultLiesBesideTheProgram) {
  const auto program = std::filesystem::read_symlink("/proc/self/exe");
  EXPECT_EQ(LinuxTraceAnalysis::defaultPath(), program.parent_path().string() + "/../lib/tarnkit/traceanalysis.so");
  EXPECT_NE(LinuxTraceAnalysis(LinuxTraceAnalysis::defaultPath(), log_).load().library, nullptr);
}

}  // namespace
}  // namespace tarn::linux_host
