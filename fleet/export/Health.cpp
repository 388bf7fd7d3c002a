// SPDX-License-Identifier: Apache-2.0
#include "fleet/export/Health.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <string_view>

#include "fleet/export/JsonLine.h"
#include "host/system/FileLock.h"
#include "host/system/FileReplacement.h"
#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/EscapedText.h"

namespace tarn::fleet {

namespace {

constexpr std::chrono::seconds kBetweenErrors{10};
constexpr std::chrono::seconds kBetweenLines{5};
constexpr std::size_t kMostErrorBytes = 16384;

std::string secondsBetween(std::chrono::nanoseconds from, std::chrono::nanoseconds to) {
  return std::to_string(std::chrono::duration_cast<std::chrono::seconds>(to - from).count()) + " s";
}

// Whether a process holds the lock. One that begins just then waits for us.
Result<bool> isRunning(const std::string& lock) {
  const linux_host::UniqueDescriptor file(::open(lock.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
  if (!file && errno == ENOENT) return {};
  if (!file) return {{}, linux_host::errorOf(lock, errno)};
  return {linux_host::FileLock::take(file.get(), {}).failed(), {}};
}

// When a file was written last, epoch seconds; nothing without one.
std::optional<double> timeOf(const std::string& path) {
  std::error_code error;
  const auto written = std::filesystem::last_write_time(path, error);
  if (error) return std::nullopt;
  const auto time = std::chrono::file_clock::to_sys(written).time_since_epoch();
  return std::chrono::duration<double>(time).count();
}

Status appendLastError(JsonLine& line, const std::string& path) {
  const Result<std::string> text = linux_host::readSmallFile(path, kMostErrorBytes);
  if (text.error.code() == ENOENT) return {};
  if (text.failed()) return linux_host::errorOf(path, *text.error);
  double time = 0;
  const char* const end = text.value.data() + text.value.size();
  const char* const rest = std::from_chars(text.value.data(), end, time).ptr;
  std::string_view error(rest, static_cast<std::size_t>(end - rest));
  error.remove_prefix(std::min<std::size_t>(1, error.size()));
  line.text("last_error", error.substr(0, error.find('\n')));
  line.number("last_error_time", time);
  return {};
}

}  // namespace

void Health::note(const Status& status) {
  if (status.failed() && status->text != fault_) {
    log_.write(LogLevel::Error, status->text);
  }
  fault_ = status.failed() ? status->text : "";
}

void Health::note(const Exporter& exporter, const SendWindow& window, const ExportClock& now) {
  const bool fails = window.failures() > 0;
  const std::string& error = window.counts().lastError;
  if (fails != fails_) {
    log_.write(LogLevel::Default, fails ? "messages aren't taken: " + error
                                        : "messages are taken again, after " + secondsBetween(since_, now.monotonic));
    since_ = now.monotonic;
    fails_ = fails;
    nextTold_ = {};
    keptError_.clear();
  }
  if (fails && error != keptError_) {
    keepError(error, now);
  }
  if (now.monotonic >= nextTold_ && manager_.listens()) {
    nextTold_ = now.monotonic + kBetweenLines;
    tellManager(exporter, now);
  }
}

void Health::keepError(const std::string& text, const ExportClock& now) {
  if (now.monotonic < nextKept_) return;
  nextKept_ = now.monotonic + kBetweenErrors;
  keptError_ = text;
  std::string content = std::to_string(now.epochSeconds) + " ";
  plist::appendPrintable(content, text, plist::LineEnds::Escaped);
  if (const Status kept = linux_host::replaceFile(errorFile_, errorFile_ + ".new", content + "\n"); kept.failed()) {
    log_.write(LogLevel::Debug, errorFile_ + ": " + kept->text);
  }
}

void Health::tellManager(const Exporter& exporter, const ExportClock& now) {
  std::string line = "up to event " + std::to_string(exporter.arrived()) + " all has arrived";
  if (fails_) {
    line += "; messages aren't taken for " + secondsBetween(since_, now.monotonic) + ": " + keptError_;
  } else if (!exporter.isAtTheEnd()) {
    line += ", more is on its way";
  }
  if (line == told_) return;
  manager_.notifyStatus(line);
  told_ = std::move(line);
}

Status showStatus(const ExportOptions& options, Mode mode, StoreTail& store, double now, std::ostream& out) {
  const std::string& own = options.ownDirectory;
  std::string text;
  {
    JsonLine line(text, "status");
    line.text("mode", mode == Mode::Off ? "off" : mode == Mode::Local ? "local" : "export");
    if (mode != Mode::Off) {
      const Result<bool> running = isRunning(own + "/lock");
      if (running.failed()) return running.error;
      line.raw("running", running.value ? "true" : "false");
      const Result<ReadCursor> cursor = CursorFile(own + "/cursor").read();
      if (cursor.failed()) return cursor.error;
      line.number("arrived", cursor.value.cursor.event);
      const Result<recorder::EventPage> next = store.read(cursor.value.cursor.event, 1);
      if (next.failed()) return next.error;
      line.number("queue_seconds", next.value.rows.empty() ? 0 : std::max(0.0, now - next.value.rows.front().time));
      if (const std::optional<double> time = timeOf(own + "/cursor")) {
        line.number("last_success_time", *time);
      }
      if (Status read = appendLastError(line, own + "/error"); read.failed()) return read;
    }
  }
  out << text;
  return {};
}

}  // namespace tarn::fleet
