// SPDX-License-Identifier: Apache-2.0
// What it takes to ask a full store: a range of time, a session, and a name that is rare.
#include <sqlite3.h>

#include <atomic>
#include <cstdint>
#include <string>

#include "bench/Measure.h"
#include "bench/Message.h"
#include "bench/figures/Figures.h"
#include "host/machine/LinuxClock.h"
#include "recorder/Recorder.h"
#include "recorder/store/reading/EventReader.h"
#include "recorder/store/rows/Connection.h"
#include "recorder/store/rows/Statement.h"
#include "testing/RecordingLog.h"

namespace tarn::bench {

namespace {

constexpr std::int64_t kMegabytes = 256;
constexpr double kTarget = 20e-3;
constexpr double kSecondsBetween = 0.25;
constexpr double kAsked = 120;
constexpr std::size_t kSessionMessages = 500;
constexpr std::size_t kRare = 5000;
constexpr std::size_t kGroup = 4096;

std::atomic<std::int64_t> session{0};

// Messages four a second by their times, each with two events, 500 a session; every 5000th has another name.
class FullStore {
 public:
  explicit FullStore(const Settings& settings)
      : directory_(settings.directory), recorder_(optionsOf(settings, directory_.path()), log_, clock_) {
    recorder_.start();
    for (std::size_t i = 0; recorder_.counters().expired == 0; ++i) {
      session = static_cast<std::int64_t>(i / kSessionMessages + 1);
      latest_ = static_cast<double>(i) * kSecondsBetween;
      const plist::Dictionary message = makeLoggedMessage(i, i);
      const bool isRare = i % kRare == 0;
      recorder_.record("tally", isRare ? "sys.oxbow.tarnkit.Rare" : "sys.oxbow.tarnkit.Playback.Start", message, {},
                       latest_);
      recorder_.record("tally", isRare ? "sys.oxbow.generic.Rare" : "sys.oxbow.generic.Playback.Start", message, {},
                       latest_);
      if (i % kGroup == 0 && !recorder_.flush(std::chrono::seconds(30))) {
        fail("the store can't be filled");
      }
    }
    recorder_.shutdown();
    file_ = directory_.path() + "/recorder.sqlite3";
  }

  // Seconds until all that is asked for was read, by a reader that opens the file.
  double ask(const recorder::EventQuery& asked) const {
    const double start = nowSeconds();
    recorder::EventReader reader(file_);
    recorder::EventQuery query = asked;
    std::size_t rows = 0;
    for (bool more = true; more;) {
      const Result<recorder::EventPage> page = reader.read(query);
      if (page.failed()) {
        fail(page.error.text());
      }
      rows += page.value.rows.size();
      query.after = page.value.lookedUpTo;
      more = page.value.more;
    }
    if (rows == 0) {
      fail("a query found nothing");
    }
    return nowSeconds() - start;
  }
  // The same of a question to the view that people ask, by SQLite alone.
  double askPlainly(const std::string& where) const {
    const double start = nowSeconds();
    recorder::Connection connection;
    recorder::Statement rows;
    if (connection.open(file_, SQLITE_OPEN_READONLY) != SQLITE_OK ||
        rows.prepare(connection.handle(), "SELECT * FROM events WHERE " + where + " ORDER BY id") != SQLITE_OK) {
      fail(connection.errorText());
    }
    std::size_t found = 0;
    while (rows.step() == SQLITE_ROW) {
      ++found;
    }
    if (found == 0) {
      fail("a plain query found nothing");
    }
    return nowSeconds() - start;
  }
  double middle() const { return latest_ / 2; }
  std::int64_t middleSession() const { return session / 2; }

 private:
  static recorder::RecorderOptions optionsOf(const Settings& settings, const std::string& directory) {
    recorder::RecorderOptions options;
    options.file = directory + "/recorder.sqlite3";
    options.maxMegabytes = settings.quick ? 4 : kMegabytes;
    options.sessionOf = []() noexcept { return session.load(std::memory_order_relaxed); };
    return options;
  }

  TemporaryDirectory directory_;
  linux_host::LinuxClock clock_;
  tarn::testing::RecordingLog log_;
  recorder::Recorder recorder_;
  std::string file_;
  double latest_ = 0;
};

}  // namespace

void measureQueries(const Settings& settings, Table& table) {
  const FullStore store(settings);
  const auto measure = [&](const char* what, const recorder::EventQuery& query) {
    Samples samples;
    for (int round = 0; round < settings.rounds; ++round) {
      samples.push_back(store.ask(query));
    }
    const double took = median(samples);
    table.addWithTarget({what, milliseconds(took), {}, {}, "<= 20 ms", {}}, took, kTarget);
  };
  recorder::EventQuery time;
  time.since = store.middle();
  time.until = store.middle() + kAsked;
  measure("a full store asked for two minutes", time);
  recorder::EventQuery ofSession;
  ofSession.session = store.middleSession();
  measure("a full store asked for a session", ofSession);
  recorder::EventQuery ofName;
  ofName.nameGlob = "*.tarnkit.Rare";
  measure("a full store asked for a rare name", ofName);
  const auto measurePlain = [&](const char* what, const std::string& where, bool isJudged) {
    Samples samples;
    for (int round = 0; round < settings.rounds; ++round) {
      samples.push_back(store.askPlainly(where));
    }
    const double took = median(samples);
    if (isJudged) {
      table.addWithTarget({what, milliseconds(took), {}, {}, "<= 20 ms", {}}, took, kTarget);
    } else {
      table.add({what, milliseconds(took), {}, {}, "", {}});
    }
  };
  measurePlain("  in SQL alone: a session", "session = " + std::to_string(store.middleSession()), true);
  measurePlain("  in SQL alone: a rare name", "name = 'sys.oxbow.tarnkit.Rare'", true);
  measurePlain("  in SQL alone: two minutes, gone through",
               "time >= " + std::to_string(store.middle()) + " AND time < " + std::to_string(store.middle() + kAsked),
               false);
}

}  // namespace tarn::bench
