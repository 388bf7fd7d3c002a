// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/ExportProgram.h"

#include <algorithm>
#include <chrono>
#include <memory>
#include <random>
#include <utility>

#include "fleet/export/Exporter.h"
#include "fleet/export/Health.h"
#include "fleet/publish/FolderPublisher.h"
#include "fleet/publish/JetStreamPublisher.h"
#include "host/loop/ServiceManager.h"
#include "host/system/FileLock.h"
#include "host/system/Files.h"
#include "host/system/SystemError.h"
#include "plist/Hex.h"
#include "tools/ctl/terminal/StopRequest.h"
#include "tools/ctl/terminal/TimeOption.h"

namespace tarn::fleet {

namespace {

constexpr const char* kProgram = "tarnreporting-export";
constexpr const char* kStore = "/recorder.sqlite3";
constexpr mode_t kOwnMode = 0750;
constexpr std::int64_t kMebibyte = std::int64_t{1} << 20U;
// Between two looks, when there is nothing to do.
constexpr std::chrono::milliseconds kRest{500};
constexpr std::chrono::milliseconds kWait{200};
// What a store or a disk that fails is left alone for.
constexpr double kSecondsAfterFault = 1;
// Whoever asks for the status holds the lock for a moment.
constexpr std::chrono::milliseconds kLockPatience{200};
// For what is on its way when a signal ends it.
constexpr std::chrono::seconds kLastWait{2};

std::chrono::nanoseconds monotonicNow() {
  return std::chrono::steady_clock::now().time_since_epoch();
}

ExportClock clockNow() {
  return {ctl::currentTime(), monotonicNow()};
}

Result<std::unique_ptr<Publisher>> publisherOf(const ExportOptions& options, const ExportConfiguration& configuration,
                                               const std::string& device) {
  if (configuration.rules.mode == Mode::Local) {
    const std::string folder = configuration.folder.empty() ? options.ownDirectory + "/messages" : configuration.folder;
    return {std::make_unique<FolderPublisher>(folder, configuration.maxMegabytes * kMebibyte), {}};
  }
  std::string name;
  plist::appendHex(name, std::string_view(device));
  auto publisher = std::make_unique<JetStreamPublisher>(configuration.server, name);
  if (Status opened = publisher->open(); opened.failed()) return {{}, std::move(opened)};
  return {std::move(publisher), {}};
}

// The publisher's library tells of what wasn't answered; where it doesn't, the window takes that for granted.
WindowLimits limitsOf(const ServerSettings& settings) {
  constexpr std::chrono::seconds kMore{2};
  WindowLimits limits;
  limits.patience = std::chrono::seconds(settings.answerSeconds) + kMore;
  return limits;
}

BackoffLimits pausesOf(const ServerSettings& settings) {
  BackoffLimits limits;
  limits.most = std::chrono::seconds(settings.longestPauseSeconds);
  return limits;
}

class Program {
 public:
  Program(const ExportOptions& options, const ExportConfiguration& configuration, const FleetKey& key,
          const std::string& device, const ProgramLog& log, Publisher& publisher)
      : options_(options),
        log_(log),
        store_(options.stateDirectory + kStore),
        sieve_(configuration.rules, key),
        cursor_(options.ownDirectory + "/cursor"),
        arrived_(options.ownDirectory + "/arrived"),
        window_(publisher, Backoff(std::random_device()(), pausesOf(configuration.server)),
                limitsOf(configuration.server)),
        exporter_(store_, sieve_, device, cursor_, arrived_, window_, publisher) {}

  int run() {
    const Result<std::string> begun = exporter_.begin();
    if (begun.failed()) {
      log_.write(LogLevel::Error, begun.error->text);
      return kExitFailure;
    }
    if (!begun.value.empty()) {
      log_.write(LogLevel::Default, begun.value);
    }
    ctl::stopOnSignals();
    while (!ctl::isStopRequested()) {
      const Status status = exporter_.step(clockNow(), kWait);
      health_.note(status);
      health_.note(exporter_, window_, clockNow());
      tellAsked();
      if (status.failed()) {
        if (options_.once) return kExitFailure;
        ctl::pauseUnlessStopped(std::chrono::duration<double>(kSecondsAfterFault));
      } else if (exporter_.isAtTheEnd()) {
        if (options_.once) break;
        store_.waitForChange(kRest);
      }
    }
    finish();
    return 0;
  }

 private:
  void tellAsked() {
    if (exporter_.askedAgain() == toldAsked_) return;
    log_.write(LogLevel::Default, std::to_string(exporter_.askedAgain() - toldAsked_) + " ids were asked for again");
    toldAsked_ = exporter_.askedAgain();
  }
  // What is on its way may arrive; it would be sent again otherwise.
  void finish() {
    const auto until = monotonicNow() + kLastWait;
    while (!window_.isEmpty() && window_.failures() == 0 && monotonicNow() < until) {
      health_.note(exporter_.settle(clockNow(), kWait));
    }
    log_.write(LogLevel::Debug, "arrived: up to event " + std::to_string(exporter_.arrived()));
  }

  const ExportOptions& options_;
  const ProgramLog& log_;
  StoreTail store_;
  PrivacySieve sieve_;
  CursorFile cursor_;
  ArrivedFile arrived_;
  SendWindow window_;
  Exporter exporter_;
  linux_host::ServiceManager manager_;
  Health health_{log_, manager_, options_.ownDirectory};
  std::int64_t toldAsked_ = 0;
};

}  // namespace

int runExport(const ExportOptions& options, const ExportConfiguration& configuration, const FleetKey& key,
              const std::string& device) {
  const ProgramLog log(kProgram, options.logLevel);
  const auto fail = [&log](const Error& error) {
    log.write(LogLevel::Error, error.text);
    return kExitFailure;
  };
  if (const Status made = linux_host::createDirectories(options.ownDirectory, kOwnMode); made.failed()) {
    return fail(linux_host::errorOf(options.ownDirectory, *made));
  }
  // Two of them would undo each other's cursor.
  linux_host::FileLock lock;
  if (const Status taken = lock.take(options.ownDirectory + "/lock", kLockPatience); taken.failed()) {
    return fail({0, options.ownDirectory + ": another one works with it"});
  }
  const auto publisher = publisherOf(options, configuration, device);
  if (publisher.failed()) return fail(*publisher.error);
  return Program(options, configuration, key, device, log, *publisher.value).run();
}

}  // namespace tarn::fleet
