// What recording costs: the hand-over alone, the way to the disk, and the processor time of both.
#include <benchmark/benchmark.h>
#include <sqlite3.h>
#include <sys/resource.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "bench/Message.h"
#include "platform/Clock.h"
#include "platform/Log.h"
#include "recorder/Recorder.h"
#include "recorder/RecorderTallyService.h"

namespace {

using tarn::plist::Dictionary;
using tarn::recorder::Recorder;
using tarn::recorder::RecorderOptions;

class NoLog final : public tarn::platform::Log {
 public:
  void write(const tarn::platform::LogEntry&) noexcept override {}
};

class SteadyClock final : public tarn::platform::Clock {
 public:
  double epochSeconds() const noexcept override {
    return std::chrono::duration<double>(std::chrono::system_clock::now().time_since_epoch()).count();
  }
  std::chrono::nanoseconds monotonic() const noexcept override {
    return std::chrono::steady_clock::now().time_since_epoch();
  }
  double systemUptimeSeconds() const noexcept override { return 0; }
  std::int64_t processorTicks() const noexcept override { return 0; }
};

// A directory of its own on the file system of the working directory.
class Directory {
 public:
  Directory() : path_("recorder-bench-" + std::to_string(::getpid())) { std::filesystem::create_directories(path_); }
  ~Directory() { std::filesystem::remove_all(path_); }
  Directory(const Directory&) = delete;
  Directory& operator=(const Directory&) = delete;
  std::filesystem::path file() const { return path_ / "recorder.sqlite3"; }

 private:
  std::filesystem::path path_;
};

Dictionary makeMessage(std::uint64_t number) {
  return tarn::bench::makeLoggedMessage(number, number);
}

double processorSeconds() {
  rusage usage{};
  ::getrusage(RUSAGE_SELF, &usage);
  const auto seconds = [](const timeval& t) {
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_usec) / 1e6;
  };
  return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

// Both events of `count` messages, each message a dictionary of its own; waits while the recorder is full, as the
// sockets' thread does.
void recordMessages(Recorder& recorder, const std::vector<Dictionary>& messages) {
  for (const Dictionary& message : messages) {
    while (recorder.isFull()) std::this_thread::sleep_for(std::chrono::microseconds(200));
    recorder.record("tally", "sys.oxbow.tarnkit.Playback.Start", message, {}, 1763632800.5);
    recorder.record("tally", "sys.oxbow.generic.Playback.Start", message, {}, 1763632800.5);
  }
}

std::vector<Dictionary> makeMessages(int count) {
  std::vector<Dictionary> messages;
  messages.reserve(static_cast<std::size_t>(count));
  for (int n = 0; n < count; ++n) messages.push_back(makeMessage(static_cast<std::uint64_t>(n)));
  return messages;
}

// The hand-over as the server queue sees it, with the writer at work beside it.
void handOver(benchmark::State& state) {
  NoLog log;
  SteadyClock clock;
  const Directory directory;
  RecorderOptions options;
  options.file = directory.file();
  Recorder recorder(options, log, clock);
  recorder.start();
  recorder.waitUntilOpened();
  const std::vector<Dictionary> messages = makeMessages(2000);
  for (auto _ : state) {
    for (const Dictionary& message : messages) {
      recorder.record("tally", "sys.oxbow.tarnkit.Playback.Start", message, {}, 1763632800.5);
      recorder.record("tally", "sys.oxbow.generic.Playback.Start", message, {}, 1763632800.5);
    }
    state.PauseTiming();
    if (!recorder.flush(std::chrono::seconds(30))) state.SkipWithError("the events were not committed");
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * 4000);
}
BENCHMARK(handOver)->UseRealTime()->Unit(benchmark::kMillisecond);

// 50,000 messages, two events each, from the first hand-over until all is committed. The argument is max_megabytes:
// with a small one retention works all the time.
void untilCommitted(benchmark::State& state) {
  NoLog log;
  SteadyClock clock;
  const Directory directory;
  RecorderOptions options;
  options.file = directory.file();
  options.maxMegabytes = state.range(0);
  Recorder recorder(options, log, clock);
  recorder.start();
  recorder.waitUntilOpened();
  constexpr int kMessages = 50'000;
  const std::vector<Dictionary> messages = makeMessages(kMessages);
  const double before = processorSeconds();
  for (auto _ : state) {
    recordMessages(recorder, messages);
    if (!recorder.flush(std::chrono::seconds(60))) state.SkipWithError("the events were not committed");
  }
  const double messagesDone = static_cast<double>(state.iterations()) * kMessages;
  state.counters["messages/s"] = benchmark::Counter(messagesDone, benchmark::Counter::kIsRate);
  state.counters["cpu_us/message"] = (processorSeconds() - before) * 1e6 / messagesDone;
}
BENCHMARK(untilCommitted)->Arg(1024)->Arg(32)->UseRealTime()->Unit(benchmark::kMillisecond)->Iterations(5);

// One event on an idle recorder, until it is committed.
void oneEvent(benchmark::State& state) {
  NoLog log;
  SteadyClock clock;
  const Directory directory;
  RecorderOptions options;
  options.file = directory.file();
  Recorder recorder(options, log, clock);
  recorder.start();
  recorder.waitUntilOpened();
  const Dictionary message = makeMessage(1);
  for (auto _ : state) {
    const auto committed = recorder.counters().committed;
    recorder.record("tally", "sys.oxbow.tarnkit.Playback.Start", message, {}, 1763632800.5);
    while (recorder.counters().committed == committed) std::this_thread::sleep_for(std::chrono::microseconds(100));
  }
}
BENCHMARK(oneEvent)->UseRealTime()->Unit(benchmark::kMillisecond)->Iterations(20);

// The limit: the same rows, their texts formed beforehand, in SQLite alone at 1000 rows a synchronous commit.
void sqliteAlone(benchmark::State& state) {
  const Directory directory;
  sqlite3* database = nullptr;
  sqlite3_open(directory.file().c_str(), &database);
  sqlite3_exec(
      database,
      "PRAGMA journal_mode=WAL; PRAGMA synchronous=FULL;"
      "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT)",
      nullptr, nullptr, nullptr);
  sqlite3_stmt* insert = nullptr;
  sqlite3_prepare_v2(database, "INSERT INTO events VALUES(NULL, 1763632800.5, 'tally', ?1, ?2, '{}')", -1, &insert,
                     nullptr);
  const std::string payload(300, 'x');
  constexpr int kRows = 100'000;
  for (auto _ : state) {
    for (int row = 0; row < kRows; ++row) {
      if (row % 1000 == 0) sqlite3_exec(database, "BEGIN", nullptr, nullptr, nullptr);
      sqlite3_bind_text(insert, 1, "sys.oxbow.tarnkit.Playback.Start", -1, nullptr);
      sqlite3_bind_text(insert, 2, payload.data(), static_cast<int>(payload.size()), nullptr);
      sqlite3_step(insert);
      sqlite3_reset(insert);
      if (row % 1000 == 999) sqlite3_exec(database, "COMMIT", nullptr, nullptr, nullptr);
    }
  }
  sqlite3_finalize(insert);
  sqlite3_close(database);
  state.counters["rows/s"] =
      benchmark::Counter(static_cast<double>(state.iterations()) * kRows, benchmark::Counter::kIsRate);
}
BENCHMARK(sqliteAlone)->UseRealTime()->Unit(benchmark::kMillisecond)->Iterations(3);

}  // namespace

BENCHMARK_MAIN();
