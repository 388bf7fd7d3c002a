// SPDX-License-Identifier: Apache-2.0
#include "host/traces/TraceFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <utility>

#include "host/system/SmallFile.h"
#include "host/system/SystemError.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"

namespace tarn::linux_host {

using platform::SignpostCategory;

namespace {

constexpr std::size_t kBlockBytes = std::size_t{64} * 1024;
constexpr std::size_t kTailBytes = std::size_t{4} * 1024;  // kept for what completes the file
constexpr std::size_t kMostNamedThreads = 1024;
constexpr mode_t kFilePermissions = 0666;  // less the process's mask

std::string jsonOf(const plist::ValueView& value) {
  std::string text;
  plist::appendJson(text, value);
  return text;
}

template <class Number>
void appendNumber(std::string& out, Number number) {
  std::array<char, 32> digits{};
  const auto end = std::to_chars(digits.data(), digits.data() + digits.size(), number).ptr;
  out.append(digits.data(), end);
}

// Microseconds with all their decimals, as the format wants times.
void appendMicroseconds(std::string& out, std::chrono::nanoseconds time) {
  appendNumber(out, time.count() / 1000);
  const auto rest = static_cast<unsigned>(time.count() % 1000);
  out += '.';
  out += static_cast<char>('0' + rest / 100);
  out += static_cast<char>('0' + rest / 10 % 10);
  out += static_cast<char>('0' + rest % 10);
}

std::string_view nameOf(SignpostCategory category) noexcept {
  switch (category) {
    case SignpostCategory::Operation:
      return "operation";
    case SignpostCategory::Message:
      return "message";
    case SignpostCategory::Worker:
      return "worker";
    case SignpostCategory::BackEnd:
      return "backEnd";
    case SignpostCategory::TracePoint:
      return "tracePoint";
  }
  return "other";
}

std::string threadName(std::int32_t thread) {
  auto [name, error] = readSmallFile("/proc/self/task/" + std::to_string(thread) + "/comm", 64);
  while (name.ends_with('\n')) {
    name.pop_back();
  }
  return error.failed() || name.empty() ? "thread " + std::to_string(thread) : name;
}

}  // namespace

TraceFile::TraceFile(Facts facts) : facts_(std::move(facts)), process_(::getpid()) {}

Status TraceFile::open() {
  std::string path = facts_.directory + "/." + facts_.name + ".partial";
  UniqueDescriptor made(::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kFilePermissions));
  if (!made) return lastSystemError();
  file_.begin(std::move(made), std::move(path));
  put("{\"traceEvents\":[\n{\"ph\":\"M\",\"pid\":");
  put(std::to_string(process_));
  put(R"(,"name":"process_name","args":{"name":)");
  put(jsonOf(threadName(process_)));
  put("}}");
  return flush();
}

void TraceFile::write(const SignpostRecord& record) {
  nameThread(record.thread, record.at);
  const bool isInterval = record.duration.count() >= 0;
  beginEvent(isInterval ? "X" : "i", record.at, record.thread);
  if (isInterval) {
    event_ += ",\"dur\":";
    appendMicroseconds(event_, record.duration);
  } else {
    event_ += R"(,"s":"t")";
  }
  appendNames(record.signpost);
  if (facts_.writesArguments && !record.signpost.argument.name.empty()) {
    event_ += R"(,"args":{")";
    event_ += record.signpost.argument.name;
    event_ += "\":";
    appendNumber(event_, record.signpost.argument.value);
    event_ += '}';
  }
  ++(endEvent(record.at) ? events_ : leftOut_);
}

void TraceFile::writeCounter(std::string_view name, std::string_view unit, std::int64_t value,
                             std::chrono::nanoseconds at) {
  if (full_) return;
  beginEvent("C", at, process_);
  event_ += R"(,"cat":")";
  event_ += platform::kSignpostSubsystem;
  event_ += R"(,load","name":")";
  event_ += name;
  event_ += R"(","args":{")";
  event_ += unit;
  event_ += "\":";
  appendNumber(event_, value);
  event_ += '}';
  static_cast<void>(endEvent(at));
}

void TraceFile::writeLost(std::uint64_t count, std::chrono::nanoseconds at) {
  leftOut_ += count;
  beginEvent("i", at, process_);
  event_ += R"(,"s":"p","cat":")";
  event_ += platform::kSignpostSubsystem;
  event_ += R"(,trace","name":"tarnkit.eventsLost","args":{"count":)";
  appendNumber(event_, count);
  event_ += '}';
  static_cast<void>(endEvent(at));
}

Status TraceFile::flush() {
  writeOut();
  return file_.failure();
}

Result<std::string> TraceFile::finish() {
  put("\n],\n\"displayTimeUnit\":\"ns\",\n\"otherData\":{\"token\":");
  put(jsonOf(facts_.token));
  put(",\"template\":");
  put(std::to_string(facts_.templateNumber));
  put(",\"beganEpochSeconds\":");
  put(jsonOf(facts_.began));
  put(",\"events\":");
  put(std::to_string(events_));
  put(",\"eventsLeftOut\":");
  put(std::to_string(leftOut_));
  put(full_ ? ",\"full\":true}}\n" : ",\"full\":false}}\n");
  writeOut();
  std::string path = facts_.directory + "/" + facts_.name;
  if (auto error = file_.takePlace(path); error.failed()) return {{}, std::move(error)};
  return {std::move(path), {}};
}

void TraceFile::beginEvent(std::string_view phase, std::chrono::nanoseconds at, std::int32_t thread) {
  event_ = ",\n{\"ph\":\"";
  event_ += phase;
  event_ += R"(","pid":)";
  appendNumber(event_, process_);
  event_ += ",\"tid\":";
  appendNumber(event_, thread);
  event_ += ",\"ts\":";
  appendMicroseconds(event_, at);
}

// Names are texts of this program's source and of its tables: nothing in them asks for an escape.
void TraceFile::appendNames(const platform::Signpost& signpost) {
  event_ += R"(,"cat":")";
  event_ += platform::kSignpostSubsystem;
  event_ += ',';
  event_ += nameOf(signpost.category);
  event_ += R"(","name":")";
  event_ += signpost.subject;
  event_ += '.';
  event_ += signpost.verb;
  event_ += '"';
}

void TraceFile::nameThread(std::int32_t thread, std::chrono::nanoseconds at) {
  if (full_ || namedThreads_.size() >= kMostNamedThreads || !namedThreads_.insert(thread).second) return;
  event_ = ",\n{\"ph\":\"M\",\"pid\":";
  appendNumber(event_, process_);
  event_ += ",\"tid\":";
  appendNumber(event_, thread);
  event_ += R"(,"name":"thread_name","args":{"name":)";
  plist::appendJsonText(event_, threadName(thread));
  event_ += "}";
  static_cast<void>(endEvent(at));
}

// Whether the event is in the file.
bool TraceFile::endEvent(std::chrono::nanoseconds at) {
  event_ += '}';
  if (!full_ && bytes_ + event_.size() + kTailBytes > facts_.mostBytes) {
    full_ = true;
    const std::string beyond = std::exchange(event_, {});
    beginEvent("i", at, process_);
    event_ += R"(,"s":"p","cat":")";
    event_ += platform::kSignpostSubsystem;
    event_ += R"(,trace","name":"tarnkit.traceFull"})";
    put(event_);
  }
  if (full_) return false;
  put(event_);
  return true;
}

void TraceFile::put(std::string_view text) {
  heldBack_ += text;
  bytes_ += text.size();
  if (heldBack_.size() >= kBlockBytes) {
    writeOut();
  }
}

void TraceFile::writeOut() {
  file_.write(heldBack_);
  heldBack_.clear();
}

}  // namespace tarn::linux_host
