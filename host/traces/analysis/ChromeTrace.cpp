// SPDX-License-Identifier: Apache-2.0
#include "host/traces/analysis/ChromeTrace.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <functional>
#include <map>
#include <memory>
#include <system_error>
#include <unordered_map>
#include <utility>

#include "host/traces/analysis/JsonScanner.h"

namespace tarn::trace_analysis {

namespace {

// Beyond it nanoseconds don't fit; some hundred years.
constexpr double kMostMicroseconds = 4e15;

struct Event {
  char phase = 0;
  bool hasTime = false;
  bool hasDuration = false;
  bool hasName = false;
  std::int64_t process = 0;
  std::int64_t thread = 0;
  std::int64_t time = 0;      // nanoseconds
  std::int64_t duration = 0;  // nanoseconds
  std::uint32_t name = 0;
  std::uint32_t subsystem = 0;
};

class Texts {
 public:
  std::uint32_t number(std::string_view text) {
    if (const auto known = numbers_.find(text); known != numbers_.end()) return known->second;
    const auto next = static_cast<std::uint32_t>(texts_.size());
    numbers_.emplace(texts_.emplace_back(text), next);
    return next;
  }
  std::vector<std::string> take() { return std::move(texts_); }

 private:
  struct Hash {
    using is_transparent = void;  // NOLINT(readability-identifier-naming): the standard library's name
    std::size_t operator()(std::string_view text) const noexcept { return std::hash<std::string_view>()(text); }
  };
  std::unordered_map<std::string, std::uint32_t, Hash, std::equal_to<>> numbers_;
  std::vector<std::string> texts_;
};

// The members of the text that matter.
enum class Member { Other, Events, Phase, Process, Thread, Time, Duration, Name, Category };

Member memberOf(std::string_view key) noexcept {
  constexpr std::pair<std::string_view, Member> kMembers[] = {
      {"name", Member::Name},    {"cat", Member::Category}, {"ph", Member::Phase},   {"ts", Member::Time},
      {"dur", Member::Duration}, {"pid", Member::Process},  {"tid", Member::Thread}, {"traceEvents", Member::Events}};
  for (const auto& [name, member] : kMembers) {
    if (key == name) return member;
  }
  return Member::Other;
}

// Keeps the events that may make intervals and looks past everything else.
class Listener final : public JsonListener {
 public:
  explicit Listener(const TraceLimits& limits) : limits_(limits) {}

  std::vector<Event>& events() { return events_; }
  std::vector<std::string> takeTexts() { return texts_.take(); }
  bool foundEvents() const { return eventsDepth_ != 0; }
  const Status& failure() const { return failure_; }

  bool beginObject() override {
    if (++depth_ == eventsDepth_ + 1 && inEvents_) {
      event_ = {};
      hasSubsystem_ = false;
      member_ = Member::Other;
    }
    return isWithinDepth();
  }
  bool key(std::string_view key) override {
    member_ = memberOf(key);
    return true;
  }
  bool endObject() override {
    if (depth_-- == eventsDepth_ + 1 && inEvents_) return keepEvent();
    return true;
  }
  bool beginArray() override {
    ++depth_;
    const bool isEvents = depth_ == 1 || (depth_ == 2 && !rootIsArray_ && member_ == Member::Events);
    if (isEvents && eventsDepth_ == 0) {
      eventsDepth_ = depth_;
      inEvents_ = true;
      rootIsArray_ = depth_ == 1;
    }
    return isWithinDepth();
  }
  bool endArray() override {
    if (depth_-- == eventsDepth_) {
      inEvents_ = false;
    }
    return true;
  }
  bool text(std::string_view text) override {
    if (!isOfEvent()) return true;
    if (member_ == Member::Phase) {
      event_.phase = text.size() == 1 ? text[0] : '\0';
    } else if (member_ == Member::Name) {
      event_.name = texts_.number(text);
      event_.hasName = true;
    } else if (member_ == Member::Category) {
      event_.subsystem = texts_.number(text.substr(0, text.find(',')));
      hasSubsystem_ = true;
    }
    return true;
  }
  bool number(const Number& number) override {
    if (!isOfEvent()) return true;
    if (member_ == Member::Process && number.isWhole) {
      event_.process = number.whole;
    }
    if (member_ == Member::Thread && number.isWhole) {
      event_.thread = number.whole;
    }
    if (member_ == Member::Time || member_ == Member::Duration) {
      takeTime(number.value);
    }
    return true;
  }

 private:
  bool isOfEvent() const { return inEvents_ && depth_ == eventsDepth_ + 1; }
  bool isWithinDepth() {
    if (depth_ <= limits_.mostDepth) return true;
    failure_ = Error{0, "its values nest too deep"};
    return false;
  }
  void takeTime(double microseconds) {
    if (!(std::abs(microseconds) <= kMostMicroseconds)) return;
    const auto nanoseconds = static_cast<std::int64_t>(std::llround(microseconds * 1000));
    if (member_ == Member::Time) {
      event_.time = nanoseconds;
      event_.hasTime = true;
    } else {
      event_.duration = nanoseconds;
      event_.hasDuration = true;
    }
  }
  bool keepEvent() {
    const bool isComplete = event_.phase == 'X' && event_.hasDuration && event_.duration >= 0 && event_.hasName;
    const bool isPart = (event_.phase == 'B' && event_.hasName) || event_.phase == 'E';
    if (!hasSubsystem_) {
      event_.subsystem = texts_.number({});
    }
    if (!event_.hasTime || !(isComplete || isPart)) return true;
    if (events_.size() >= limits_.mostEvents) {
      failure_ = Error{0, "it has more than " + std::to_string(limits_.mostEvents) + " events"};
      return false;
    }
    events_.push_back(event_);
    return true;
  }

  const TraceLimits limits_;
  std::size_t depth_ = 0;
  std::size_t eventsDepth_ = 0;  // of the array of events; 0 until it is found
  bool inEvents_ = false;
  bool rootIsArray_ = false;
  bool hasSubsystem_ = false;
  Member member_ = Member::Other;  // of the value that comes next
  Event event_;
  std::vector<Event> events_;
  Texts texts_;
  Status failure_;
};

// The begins of one thread that have no end yet, innermost last. How many of each name there are is counted, so that an
// end without its begin costs no search: a trace may hold a million of either.
class OpenIntervals {
 public:
  // Takes the thread's begins and ends in the order of time.
  void take(const Event& event, std::vector<Interval>& intervals) {
    if (event.phase == 'B') {
      begins_.push_back(event);
      ++named_[event.name];
      return;
    }
    if (event.hasName) {
      const auto named = named_.find(event.name);
      if (named == named_.end() || named->second == 0) return;  // its begin came before the trace
      while (begins_.back().name != event.name) {
        pop();  // its end never came
      }
    }
    if (begins_.empty()) return;
    const Event begin = pop();
    intervals.push_back({begin.time, event.time - begin.time, begin.name, begin.subsystem});
  }

 private:
  Event pop() {
    const Event last = begins_.back();
    begins_.pop_back();
    --named_[last.name];
    return last;
  }

  std::vector<Event> begins_;
  std::unordered_map<std::uint32_t, std::size_t> named_;
};

std::vector<Interval> intervalsOf(std::vector<Event>& events) {
  std::stable_sort(events.begin(), events.end(), [](const Event& a, const Event& b) { return a.time < b.time; });
  std::vector<Interval> intervals;
  std::map<std::pair<std::int64_t, std::int64_t>, OpenIntervals> open;
  for (const Event& event : events) {
    if (event.phase == 'X') {
      intervals.push_back({event.time, event.duration, event.name, event.subsystem});
    } else {
      open[{event.process, event.thread}].take(event, intervals);
    }
  }
  std::stable_sort(intervals.begin(), intervals.end(), [](const Interval& a, const Interval& b) {
    return a.begin != b.begin ? a.begin < b.begin : a.duration > b.duration;
  });
  return intervals;
}

Result<ChromeTrace> systemFailure(int number) {
  return {{}, Error{number, std::generic_category().message(number)}};
}

struct Descriptor {
  explicit Descriptor(int opened) : number(opened) {}
  ~Descriptor() {
    if (number >= 0) {
      ::close(number);
    }
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  const int number;
};

}  // namespace

Result<ChromeTrace> parseTrace(std::string_view bytes, const TraceLimits& limits) {
  if (bytes.size() > limits.mostBytes) return systemFailure(EFBIG);
  Result<ChromeTrace> read;
  Listener listener(limits);
  if (const auto position = scanJson(bytes, listener)) {
    read.error = listener.failure();
    if (read.ok()) {
      read.error = Error{0, "it is no whole JSON text: at byte " + std::to_string(*position)};
    }
  } else if (!listener.foundEvents()) {
    read.error = Error{0, "it has no array of trace events"};
  } else {
    read.value.intervals = intervalsOf(listener.events());
    read.value.texts = listener.takeTexts();
  }
  return read;
}

Result<ChromeTrace> readTrace(const std::string& path, const TraceLimits& limits) {
  // Not blocking, for the case that somebody put a pipe there.
  const Descriptor file(::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  if (file.number < 0) return systemFailure(errno);
  struct stat status {};
  if (::fstat(file.number, &status) != 0) return systemFailure(errno);
  if (!S_ISREG(status.st_mode)) return systemFailure(ENODEV);
  const auto size = static_cast<std::size_t>(status.st_size);
  if (size > limits.mostBytes) return systemFailure(EFBIG);
  const auto bytes = std::make_unique_for_overwrite<char[]>(size);
  std::size_t taken = 0;
  while (taken < size) {
    const ssize_t more = ::read(file.number, bytes.get() + taken, size - taken);
    if (more < 0 && errno != EINTR) return systemFailure(errno);
    if (more == 0) break;  // somebody cut it
    taken += more > 0 ? static_cast<std::size_t>(more) : 0;
  }
  return parseTrace({bytes.get(), taken}, limits);
}

}  // namespace tarn::trace_analysis
