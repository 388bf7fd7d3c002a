// SPDX-License-Identifier: Apache-2.0
#include "fleet/collect/CollectProgram.h"

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <random>
#include <utility>

#include "fleet/collect/Inquiry.h"
#include "fleet/collect/JetStreamSource.h"
#include "fleet/collect/Schema.h"
#include "fleet/publish/Backoff.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "tools/ctl/terminal/StopRequest.h"

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-collect";
constexpr int kExitFailure = 1;
constexpr std::chrono::milliseconds kWait{1000};
constexpr std::chrono::hours kBetweenRetentions{1};
// What comes together in a group of files.
constexpr std::size_t kMostFiles = 64;
constexpr std::size_t kMostFileBytes = std::size_t{2} << 20U;

using Clock = std::chrono::steady_clock;

// Tells when something begins to fail, and when it works again, and nothing in between.
class Journal {
 public:
  Journal(const ProgramLog& log, const char* again) : log_(log), again_(again) {}

  void note(const Status& status) {
    if (status.failed() && status->text != fault_) {
      log_.write(LogLevel::Default, status->text);
    }
    if (status.failed() && fault_.empty()) {
      since_ = Clock::now();
    }
    if (status.ok() && !fault_.empty()) {
      const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(Clock::now() - since_).count();
      log_.write(LogLevel::Default, std::string(again_) + ", after " + std::to_string(seconds) + " s");
    }
    fault_ = status.text();
  }

 private:
  const ProgramLog& log_;
  const char* const again_;
  std::string fault_;
  Clock::time_point since_;
};

class Program {
 public:
  Program(const CollectOptions& options, const CollectConfiguration& configuration)
      : options_(options), configuration_(configuration), log_(kProgram, options.logLevel) {}

  int migrateAlone() {
    if (Status opened = database_.open(configuration_.database, kProgram); opened.failed()) return fail(*opened);
    const Result<int> applied = migrate(database_);
    if (applied.failed()) return fail(*applied.error);
    log_.write(LogLevel::Default, std::to_string(applied.value) + " steps of the layout applied");
    return 0;
  }

  // Each file once, and no retries: whoever asks for it sees what is wrong and asks again.
  int takeFolder() {
    std::vector<std::string> files;
    std::error_code error;
    for (auto file = std::filesystem::directory_iterator(options_.folder, error);
         !error && file != std::filesystem::directory_iterator(); file.increment(error)) {
      if (file->path().extension() == ".tnf") {
        files.push_back(file->path().string());
      }
    }
    if (error) return fail({0, options_.folder + ": " + error.message()});
    std::sort(files.begin(), files.end());
    if (Status opened = openDatabase(); opened.failed()) return fail(*opened);
    for (std::size_t first = 0; first < files.size() && !ctl::isStopRequested(); first += kMostFiles) {
      const std::size_t count = std::min(kMostFiles, files.size() - first);
      if (Status taken = takeFiles({files.begin() + static_cast<std::ptrdiff_t>(first),
                                    files.begin() + static_cast<std::ptrdiff_t>(first + count)});
          taken.failed()) {
        return fail(*taken);
      }
    }
    tellCounts();
    return 0;
  }

  int run() {
    JetStreamSource source(configuration_);
    if (Status opened = source.open(); opened.failed()) return fail(*opened);
    while (!ctl::isStopRequested()) {
      if (!keepDatabase()) continue;
      forgetWhenDue();
      askWhenDue(source);
      const Status fetched = source.fetch(kWait);
      servers_.note(fetched);
      if (!pace(fetched, serverBackoff_)) continue;
      if (!source.messages().empty()) {
        writeFetched(source);
      } else if (options_.once) {
        break;
      }
    }
    source.giveBack();
    tellCounts();
    return 0;
  }

 private:
  int fail(const Error& error) {
    log_.write(LogLevel::Error, error.text);
    return kExitFailure;
  }
  void tellCounts() {
    log_.write(LogLevel::Debug,
               std::to_string(counts_.records) + " records came, " + std::to_string(counts_.events) + " were new");
  }

  // Waits after a failure, longer after each; whether there was none.
  bool pace(const Status& status, Backoff& backoff) {
    if (status.ok()) {
      backoff.succeeded();
      return true;
    }
    ctl::pauseUnlessStopped(backoff.next());
    return false;
  }

  [[nodiscard]] Status openDatabase() {
    if (Status opened = database_.open(configuration_.database, kProgram); opened.failed()) return opened;
    const Result<bool> isReady = isMigrated(database_);
    if (isReady.failed()) return isReady.error;
    if (!isReady.value && options_.keepLayout) {
      return Error{kFaultOfPlace, "database: its layout isn't up to date; tarnreporting-collect --migrate does that"};
    }
    if (!isReady.value) {
      if (const Result<int> applied = migrate(database_); applied.failed()) return applied.error;
    }
    return collector_.begin();
  }

  // Whether there is one.
  bool keepDatabase() {
    if (database_.isOpen()) return true;
    const Status opened = openDatabase();
    databases_.note(opened);
    if (opened.failed()) {
      database_.close();
    }
    return pace(opened, databaseBackoff_);
  }

  void take(const CollectedGroup& group, const std::vector<CollectedMessage>& messages) {
    counts_.events += group.written.events;
    counts_.records += group.written.records;
    for (const Refusal& refusal : group.refused) {
      const CollectedMessage& message = messages[refusal.message];
      log_.write(LogLevel::Default, "refused: " + message.stream + " " + std::to_string(message.sequence) + " (" +
                                        message.subject + "): " + refusal.why);
    }
  }

  // Tries for as long as it takes: nothing is acknowledged that isn't committed.
  void writeFetched(JetStreamSource& source) {
    while (!ctl::isStopRequested()) {
      if (!keepDatabase()) continue;
      const Result<CollectedGroup> group = collector_.write(source.messages());
      databases_.note(group.error);
      if (group.ok()) {
        take(group.value, source.messages());
        inquiry_.note(group.value.written.devices);
        source.acknowledge(group.value.refused);
      }
      if (pace(group.error, databaseBackoff_)) return;
    }
  }

  [[nodiscard]] Status takeFiles(const std::vector<std::string>& files) {
    std::vector<std::string> contents;
    for (const std::string& file : files) {
      Result<std::string> read = linux_host::readSmallFile(file, kMostFileBytes);
      if (read.failed()) return linux_host::errorOf(file, *read.error);
      contents.push_back(std::move(read.value));
    }
    std::vector<CollectedMessage> messages;
    for (std::size_t i = 0; i < files.size(); ++i) {
      messages.push_back({files[i], 0, "", contents[i]});
    }
    const Result<CollectedGroup> group = collector_.write(messages);
    if (group.failed()) return group.error;
    take(group.value, messages);
    return {};
  }

  void forgetWhenDue() {
    if (configuration_.retentionDays == 0 || Clock::now() < nextRetention_) return;
    nextRetention_ = Clock::now() + kBetweenRetentions;
    const auto today = std::chrono::floor<std::chrono::days>(std::chrono::system_clock::now());
    const std::chrono::year_month_day day{today - std::chrono::days(configuration_.retentionDays)};
    const auto two = [](unsigned number) { return (number < 10 ? "-0" : "-") + std::to_string(number); };
    const Result<int> dropped =
        collector_.forgetBefore(std::to_string(static_cast<int>(day.year())) + two(static_cast<unsigned>(day.month())) +
                                two(static_cast<unsigned>(day.day())));
    if (dropped.failed()) {
      log_.write(LogLevel::Default, "days are kept for now: " + dropped.error.text());
    }
    if (dropped.value > 0) {
      log_.write(LogLevel::Default, std::to_string(dropped.value) + " days dropped");
    }
  }

  // Devices for what the database lacks of them.
  void askWhenDue(JetStreamSource& source) {
    if (configuration_.againSeconds == 0 || options_.once || Clock::now() < nextLook_) return;
    nextLook_ = Clock::now() + std::chrono::seconds(configuration_.againSeconds);
    const Result<std::vector<LackedIds>> lacked = inquiry_.look();
    databases_.note(lacked.error);
    std::int64_t count = 0;
    for (const LackedIds& each : lacked.value) {
      if (Status asked = source.ask(each.device, each.ranges); asked.failed()) {
        servers_.note(asked);
        return;
      }
      count += recorder::countOf(each.ranges);
    }
    if (count > 0) {
      log_.write(LogLevel::Default, "asked for " + std::to_string(count) + " ids again, of " +
                                        std::to_string(lacked.value.size()) + " devices");
    }
  }

  const CollectOptions& options_;
  const CollectConfiguration& configuration_;
  const ProgramLog log_;
  Database database_;
  Collector collector_{database_};
  Inquiry inquiry_{database_};
  WrittenGroup counts_;
  Backoff serverBackoff_{std::random_device()()};
  Backoff databaseBackoff_{std::random_device()()};
  Journal servers_{log_, "the server answers again"};
  Journal databases_{log_, "the database takes it again"};
  Clock::time_point nextRetention_{};
  Clock::time_point nextLook_{};
};

}  // namespace

int runCollect(const CollectOptions& options, const CollectConfiguration& configuration) {
  Program program(options, configuration);
  if (options.migrate) return program.migrateAlone();
  ctl::stopOnSignals();
  return options.folder.empty() ? program.run() : program.takeFolder();
}

}  // namespace tarn::fleet
