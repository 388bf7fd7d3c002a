// SPDX-License-Identifier: Apache-2.0
// What it takes to look at what was recorded: a report over many sessions, and at a full store the list of sessions,
// one of them, and the events of the last hour. Each from the start of the program to its end.
#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cmath>
#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/figures/Figures.h"
#include "host/machine/LinuxClock.h"
#include "recorder/Recorder.h"
#include "testing/RecordingLog.h"

namespace tarn::bench {

namespace {

constexpr double kReportTarget = 3;
constexpr double kPageTarget = 1 << 20;
constexpr double kLookTarget = 50e-3;
constexpr std::size_t kReportSessions = 1000;
constexpr std::size_t kSessionMessages = 334;  // three events each: 10^6 of 1000 sessions
constexpr std::size_t kOverloadEach = 20;
constexpr std::size_t kSegmentEach = 60;
constexpr double kSecondsBetween = 1;
constexpr std::int64_t kMegabytes = 256;
constexpr std::int64_t kNoBound = 65'536;

std::atomic<std::int64_t> session{0};

// Sessions one after the other, each with its period, its messages and what is derived of them at its stop, up to now.
class SessionStore {
 public:
  // `sessions` of them, or 0: as many as it takes until old events go.
  SessionStore(const Settings& settings, std::size_t sessions, std::int64_t megabytes)
      : directory_(settings.directory), recorder_(optionsOf(directory_.path(), megabytes), log_, clock_) {
    recorder_.start();
    const auto isDone = [&] {
      return sessions > 0 ? session >= static_cast<std::int64_t>(sessions) : recorder_.counters().expired > 0;
    };
    // Times go back from now when it is known how many there are; else they go on from a day long ago.
    const double now = clock_.epochSeconds();
    time_ = now - (sessions > 0 ? static_cast<double>(sessions * kSessionMessages) * kSecondsBetween : 20 * 86400.0);
    for (session = 0; !isDone();) {
      addSession();
    }
    recorder_.shutdown();
  }

  const std::string& directory() const { return directory_.path(); }
  double end() const { return time_; }
  std::int64_t middleSession() const { return session - session / 4; }

 private:
  static recorder::RecorderOptions optionsOf(const std::string& directory, std::int64_t megabytes) {
    recorder::RecorderOptions options;
    options.file = directory + "/recorder.sqlite3";
    options.maxMegabytes = megabytes;
    options.sessionOf = []() noexcept { return session.load(std::memory_order_relaxed); };
    return options;
  }
  void note(recorder::SessionNote::What what) {
    recorder::SessionNote note;
    note.what = what;
    note.session = session;
    note.time = time_;
    note.facts = {kReporterID,    1, 812, 1000, "player", "sys.oxbow.music." + std::to_string(session % 8), 7,
                  "longformaudio"};
    note.number = session;
    note.messages = kSessionMessages;
    note.end = platform::SessionEnd::Stopped;
    recorder_.note(std::move(note));
  }
  // As the service hands it over: under both analytics names, and to the mirror.
  void add(const std::string& kind, const plist::Dictionary& message) {
    recorder_.record("tally", "sys.oxbow.tarnkit." + kind, message, {}, time_);
    recorder_.record("tally", "sys.oxbow.longformaudio." + kind, message, {}, time_);
    recorder_.record("rtc", "sendMessage", message, {}, time_);
    time_ += kSecondsBetween;
  }
  void addSession() {
    ++session;
    note(recorder::SessionNote::What::Created);
    note(recorder::SessionNote::What::Started);
    std::int64_t overloads = 0;
    for (std::size_t i = 1; i < kSessionMessages; ++i, ++number_) {
      plist::Dictionary message = makeLoggedMessage(number_, number_);
      message.set("tarnreporting_timestamp", time_);
      if (i % kSegmentEach == 0) {
        message.set("play_seconds", static_cast<double>(kSegmentEach));
        message.set("KvSessionVolume", static_cast<double>(i % 16) / 16);
        message.set("active_devices", "BuiltInSpeaker");
        message.set("msgidx", std::int64_t{1});
        message.set("msgcnt", std::int64_t{1});
        add("Volume.Summary", message);
      } else if (i % kOverloadEach == 0) {
        message.set("issue_type", "overload");
        ++overloads;
        add("IO.IssueDetector", message);
      } else {
        add("Playback.Generic", message);
      }
    }
    add("Session_Generic.Summary", {{"summaryServiceName", "longformaudio"},
                                    {"overload_count", overloads},
                                    {"num_messages", static_cast<std::int64_t>(kSessionMessages)},
                                    {"total_active_time", 300.0},
                                    {"tarnreporting_timestamp", time_}});
    note(recorder::SessionNote::What::Stopped);
    note(recorder::SessionNote::What::Ended);
    if (!recorder_.flush(std::chrono::seconds(30))) {
      fail("the store can't be filled");
    }
  }

  TemporaryDirectory directory_;
  linux_host::LinuxClock clock_;
  tarn::testing::RecordingLog log_;
  recorder::Recorder recorder_;
  double time_ = 0;
  std::uint64_t number_ = 0;
};

struct Taken {
  double seconds = 0;    // from start to end
  double processor = 0;  // likewise, the system's work for it included
};

class Tool {
 public:
  Tool(const Settings& settings, const SessionStore& store)
      : rounds_(settings.rounds),
        program_(std::filesystem::path(settings.serviceFile).replace_filename("tarnreportingctl").string()),
        store_(store.directory()) {}

  std::string outputFile() const { return store_ + "/output"; }
  // Its output goes to a file.
  Taken run(const std::vector<std::string>& words) const {
    std::vector<std::string> all{program_, "--state-dir", store_};
    all.insert(all.end(), words.begin(), words.end());
    std::vector<char*> pointers;
    for (std::string& word : all) {
      pointers.push_back(word.data());
    }
    pointers.push_back(nullptr);
    const std::string output = outputFile();
    const double start = nowSeconds();
    const pid_t child = ::fork();
    if (child == 0) {
      ::dup2(::open(output.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600), STDOUT_FILENO);
      ::execv(pointers[0], pointers.data());
      std::_Exit(127);
    }
    int status = -1;
    rusage usage{};
    if (child < 0 || ::wait4(child, &status, 0, &usage) != child || status != 0) {
      fail("tarnreportingctl " + words.front() + " failed");
    }
    const auto seconds = [](const timeval& time) {
      return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
    };
    return {nowSeconds() - start, seconds(usage.ru_utime) + seconds(usage.ru_stime)};
  }
  void measure(const char* what, const std::vector<std::string>& words, const char* targetText, double target,
               Table& table) const {
    Samples took;
    Samples processor;
    for (int round = 0; round < rounds_; ++round) {
      const Taken taken = run(words);
      took.push_back(taken.seconds);
      processor.push_back(taken.processor);
    }
    if (std::filesystem::file_size(outputFile()) == 0) {
      fail("tarnreportingctl " + words.front() + " printed nothing");
    }
    const double median = bench::median(took);
    table.addWithTarget(
        {what, milliseconds(median), "processor time " + milliseconds(bench::median(processor)), {}, targetText, {}},
        median, target);
  }

 private:
  const int rounds_;
  const std::string program_;
  const std::string store_;
};

}  // namespace

void measureTools(const Settings& settings, Table& table) {
  {
    const SessionStore store(settings, settings.count(kReportSessions), kNoBound);
    const Tool tool(settings, store);
    tool.measure("report over 1000 sessions and 10^6 events", {"report"}, "<= 3 s", kReportTarget, table);
    const auto size = static_cast<double>(std::filesystem::file_size(tool.outputFile()));
    table.addWithTarget({"page of that report", megabytes(size), {}, {}, "<= 1 MiB", {}}, size, kPageTarget);
  }
  const SessionStore store(settings, 0, settings.quick ? 4 : kMegabytes);
  const Tool tool(settings, store);
  tool.measure("list of the sessions of a full store", {"sessions"}, "<= 50 ms", kLookTarget, table);
  tool.measure("show of a session of a full store", {"show", std::to_string(store.middleSession())}, "<= 50 ms",
               kLookTarget, table);
  tool.measure("events of the last hour of a full store",
               {"events", "--since", "@" + std::to_string(std::llround(store.end()) - 3600)}, "<= 50 ms", kLookTarget,
               table);
}

}  // namespace tarn::bench
