// SPDX-License-Identifier: Apache-2.0
#include "host/traces/TraceRecording.h"

#include <unistd.h>

#include <cerrno>
#include <cmath>
#include <utility>

#include "host/log/PrefixedLog.h"
#include "plist/CalendarDate.h"

namespace tarn::linux_host {

using platform::LogLevel;

namespace {

constexpr std::string_view kModule = "PerformanceTrace";
constexpr std::string_view kFolder = "/Audio/Traces";
constexpr std::uint32_t kFolderPermissions = 0777;

// "20261120-211717Z-tarnkit-PROCESS-NUMBER.json": no two traces of a device have the same.
std::string fileName(double epochSeconds, std::uint64_t number) {
  std::string name;
  if (const auto calendar = plist::calendarDate(std::floor(epochSeconds))) {
    plist::appendCompactDateAndTime(name, *calendar);
  }
  return name + "Z-tarnkit-" + std::to_string(::getpid()) + "-" + std::to_string(number) + ".json";
}

}  // namespace

TraceRecording::TraceRecording(const TraceParts& parts, const PerformanceTraceLimits& limits,
                               std::int32_t templateNumber, std::uint64_t number)
    : parts_(parts),
      limits_(limits),
      templateNumber_(templateNumber),
      number_(number),
      token_("trace-" + std::to_string(number)) {}

void TraceRecording::setDelegate(std::weak_ptr<platform::PerformanceTraceDelegate> delegate) {
  const MutexLock lock(mutex_);
  delegate_ = std::move(delegate);
}

bool TraceRecording::isValid() const {
  const MutexLock lock(mutex_);
  return state_ == State::Valid;
}

bool TraceRecording::askForStart() {
  const MutexLock lock(mutex_);
  if (state_ != State::New) return false;
  state_ = State::Valid;
  return true;
}

bool TraceRecording::askForStop() {
  const MutexLock lock(mutex_);
  if (state_ != State::Valid) return false;
  state_ = State::Over;
  return true;
}

void TraceRecording::release() noexcept {
  {
    const MutexLock lock(mutex_);
    released_ = true;
    state_ = State::Over;
  }
  endRecording();
}

void TraceRecording::start(bool hasRoom, std::function<void()> wake) {
  Status error;
  if (!hasRoom) {
    error = Error{EBUSY, "as many traces as may be record already"};
  } else {
    error = openFile();
  }
  if (error.failed()) {
    file_.reset();
    const MutexLock lock(mutex_);
    state_ = State::Over;
  } else if (!beginRecording(std::move(wake))) {
    file_.reset();
    return;
  }
  tell([&](auto& delegate) { delegate.performanceTraceDidStart(error); });
}

void TraceRecording::drain() {
  std::shared_ptr<SignpostBuffer> buffer;
  {
    const MutexLock lock(mutex_);
    buffer = buffer_;
  }
  if (!isOpen() || buffer == nullptr || failure_.failed()) return;
  SignpostBuffer::Content content = buffer->drain(std::move(spare_));
  for (const SignpostRecord& record : content.records) {
    file_->write(record);
  }
  if (content.lost > 0) {
    file_->writeLost(content.lost, parts_.clock.monotonic());
  }
  if (templateNumber_ == kTemplateOfProfiles) {
    sampleLoad();
  }
  spare_ = std::move(content.records);
  failure_ = file_->flush();
  if (failure_.failed()) {
    endRecording();
    logPrefixed(parts_.log, kTraceCategory, LogLevel::Error, kModule,
                "performance trace " + token_ + " can't be written and ends here: " + failure_->text);
  }
}

void TraceRecording::stop() {
  if (!isOpen()) return;  // the start failed, and its callback was the last
  endRecording();
  drain();
  tell([](auto& delegate) { delegate.performanceTraceDidStop({}); });
  Result<std::string> path{{}, failure_};
  if (failure_.ok()) {
    path = file_->finish();
    logLeftOut();
    leftOut_ = file_->leftOut();
  }
  file_.reset();
  tell([&](auto& delegate) { delegate.performanceTraceDidComplete(path.value, token_, path.error); });
}

Status TraceRecording::openFile() {
  const std::string directory =
      parts_.fileSystem.wellKnownDirectory(platform::WellKnownDirectory::DiagnosticLogs) + std::string(kFolder);
  if (auto error = parts_.fileSystem.createDirectories(directory, kFolderPermissions); error.failed()) return error;
  const double now = parts_.clock.epochSeconds();
  file_ = std::make_unique<TraceFile>(TraceFile::Facts{directory, fileName(now, number_), token_, templateNumber_,
                                                       templateNumber_ == kTemplateOfProfiles, limits_.mostBytes, now});
  return file_->open();
}

// Whether the session still wants it.
bool TraceRecording::beginRecording(std::function<void()> wake) {
  const MutexLock lock(mutex_);
  if (released_) return false;
  buffer_ = std::make_shared<SignpostBuffer>(limits_.mostBufferedEvents, parts_.clock.monotonic(), std::move(wake));
  parts_.signposts.add(buffer_);  // locked: or a release right now would come before it
  return true;
}

void TraceRecording::endRecording() noexcept {
  const MutexLock lock(mutex_);
  if (buffer_ != nullptr) {
    parts_.signposts.remove(buffer_.get());
  }
}

void TraceRecording::sampleLoad() {
  const auto now = parts_.clock.monotonic();
  file_->writeCounter("processor time", "microseconds", parts_.clock.processorTicks(), now);
  if (const auto footprint = parts_.processFacts.physicalFootprint(); footprint.ok()) {
    file_->writeCounter("memory", "bytes", static_cast<std::int64_t>(footprint.value), now);
  }
}

void TraceRecording::logLeftOut() const {
  if (file_->leftOut() == 0) return;
  logPrefixed(parts_.log, kTraceCategory, LogLevel::Error, kModule,
              "performance trace " + token_ + " left out " + std::to_string(file_->leftOut()) +
                  " events: " + (file_->isFull() ? "its file is full" : "they came faster than they could be written"));
}

// Without the lock while it runs: a callback may take the delegate away or let go of the session.
template <class Call>
void TraceRecording::tell(const Call& call) {
  std::shared_ptr<platform::PerformanceTraceDelegate> delegate;
  {
    const MutexLock lock(mutex_);
    if (!released_) {
      delegate = delegate_.lock();
    }
  }
  if (delegate != nullptr) {
    call(*delegate);
  }
}

}  // namespace tarn::linux_host
