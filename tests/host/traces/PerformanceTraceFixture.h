// SPDX-License-Identifier: Apache-2.0
// A trace service on a folder of its own, with a clock that stands still and real threads.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <memory>
#include <mutex>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "host/machine/LinuxFileSystem.h"
#include "host/traces/LinuxPerformanceTraceService.h"
#include "host/traces/LinuxSignposts.h"
#include "testing/FakeProcessFacts.h"
#include "testing/ManualClock.h"
#include "testing/RecordingLog.h"
#include "tests/host/Eventually.h"
#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {

// Notes the callbacks of a trace down, and may do something in each.
class TraceDelegate final : public platform::PerformanceTraceDelegate {
 public:
  void performanceTraceDidStart(const Status& error) override { note("start", error); }
  void performanceTraceDidStop(const Status& error) override { note("stop", error); }
  void performanceTraceDidComplete(const std::string& location, const std::string& token,
                                   const Status& error) override {
    {
      const std::lock_guard lock(mutex_);
      location_ = location;
    }
    note("complete " + token, error);
  }

  // Called on the facility's thread after the note; set before the start.
  std::function<void(const std::string&)> also;

  bool waitFor(const std::string& call) const {
    return testing::eventually([&] {
      const auto all = calls();
      return std::find(all.begin(), all.end(), call) != all.end();
    });
  }
  std::vector<std::string> calls() const {
    const std::lock_guard lock(mutex_);
    return calls_;
  }
  std::string location() const {
    const std::lock_guard lock(mutex_);
    return location_;
  }
  std::vector<std::thread::id> threads() const {
    const std::lock_guard lock(mutex_);
    return threads_;
  }

 private:
  void note(const std::string& name, const Status& error) {
    const std::string call = error.failed() ? name + ": " + error->text : name;
    {
      const std::lock_guard lock(mutex_);
      calls_.push_back(call);
      threads_.push_back(std::this_thread::get_id());
    }
    if (also) {
      also(call);
    }
  }

  mutable std::mutex mutex_;
  std::vector<std::string> calls_;
  std::vector<std::thread::id> threads_;
  std::string location_;
};

class PerformanceTraceFixture : public ::testing::Test {
 protected:
  using Json = nlohmann::json;

  // One trace and whoever listens to it.
  struct Trace {
    std::shared_ptr<TraceDelegate> delegate = std::make_shared<TraceDelegate>();
    std::shared_ptr<platform::PerformanceTraceSession> session;
  };

  void make(const PerformanceTraceLimits& limits) {
    service_ = std::make_unique<LinuxPerformanceTraceService>(
        TraceParts{signposts_, fileSystem_, clock_, processFacts_, log_}, limits);
  }
  LinuxPerformanceTraceService& service() {
    if (service_ == nullptr) {
      make({});
    }
    return *service_;
  }
  Trace makeTrace(std::int32_t templateNumber = 2) {
    Trace trace;
    trace.session = service().createSession({templateNumber, false});
    trace.session->setDelegate(trace.delegate);
    return trace;
  }
  // One that records.
  Trace startTrace(std::int32_t templateNumber = 2) {
    Trace trace = makeTrace(templateNumber);
    trace.session->startTrace();
    EXPECT_TRUE(trace.delegate->waitFor("start"));
    return trace;
  }
  // One that records, while the traces' thread stays in its callback until release().
  Trace blockedTrace() {
    Trace trace = makeTrace();
    trace.delegate->also = [this](const std::string& call) {
      if (call == "start") {
        released_.get_future().wait();
      }
    };
    trace.session->startTrace();
    EXPECT_TRUE(trace.delegate->waitFor("start"));
    return trace;
  }
  void release() { released_.set_value(); }
  // Ends it well; the file's text.
  std::string finish(const Trace& trace) {
    trace.session->stopTrace();
    EXPECT_TRUE(testing::eventually([&] { return trace.delegate->calls().size() == 3; }));
    EXPECT_FALSE(trace.delegate->location().empty());
    return readAll(trace.delegate->location());
  }

  void interval(std::string_view verb, std::chrono::nanoseconds duration, platform::SignpostArgument argument = {}) {
    const auto began = signposts_.begin();
    clock_.advance(duration);
    signposts_.end({platform::SignpostCategory::Worker, "Worker", verb, argument}, began);
  }
  void mark(std::string_view verb, std::int64_t argument = 0) {
    signposts_.mark({platform::SignpostCategory::TracePoint, "tracePoint", verb, {"argument", argument}});
  }

  static std::string readAll(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
  }
  // The events of that name.
  static std::vector<Json> events(const std::string& text, const std::string& name) {
    std::vector<Json> found;
    const Json trace = Json::parse(text);
    for (const Json& event : trace.at("traceEvents")) {
      if (event.at("name") == name) {
        found.push_back(event);
      }
    }
    return found;
  }
  // What lies in the folder of the traces, half files too.
  std::vector<std::string> files() const {
    std::vector<std::string> names;
    std::error_code none;
    for (const auto& entry : std::filesystem::directory_iterator(traces(), none)) {
      names.push_back(entry.path().filename().string());
    }
    return names;
  }
  // The file of the one trace that is being written.
  std::string partial() const { return files().empty() ? std::string() : traces() + "/" + files().front(); }
  std::string traces() const { return folder_.path("DiagnosticLogs/Audio/Traces"); }

  TemporaryFolder folder_;
  testing::ManualClock clock_;
  testing::RecordingLog log_;
  testing::FakeProcessFacts processFacts_;
  LinuxFileSystem fileSystem_{{folder_.path("DiagnosticLogs"), folder_.path("tmp")}};
  LinuxSignposts signposts_{clock_};
  std::promise<void> released_;
  std::unique_ptr<LinuxPerformanceTraceService> service_;
};

}  // namespace tarn::linux_host
