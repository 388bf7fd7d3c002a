#include "host/traces/analysis/ChromeTrace.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <map>
#include <memory>
#include <nlohmann/json.hpp>
#include <system_error>
#include <unordered_map>
#include <utility>

namespace tarn::trace_analysis {

namespace {

using Json = nlohmann::json;

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
    const auto [place, isNew] = numbers_.try_emplace(std::string(text), static_cast<std::uint32_t>(texts_.size()));
    if (isNew) texts_.emplace_back(text);
    return place->second;
  }
  std::vector<std::string> take() { return std::move(texts_); }

 private:
  std::unordered_map<std::string, std::uint32_t> numbers_;
  std::vector<std::string> texts_;
};

// Listens to the parser: keeps the events that may make intervals and looks past everything else.
class Listener final : public nlohmann::json_sax<Json> {
 public:
  explicit Listener(const TraceLimits& limits) : limits_(limits) {}

  std::vector<Event>& events() { return events_; }
  std::vector<std::string> takeTexts() { return texts_.take(); }
  bool foundEvents() const { return eventsDepth_ != 0; }
  const std::string& failure() const { return failure_; }

  bool null() override { return true; }
  bool boolean(bool /*value*/) override { return true; }
  bool number_integer(number_integer_t value) override { return takeWhole(value); }
  bool number_unsigned(number_unsigned_t value) override {
    return takeWhole(static_cast<std::int64_t>(std::min<number_unsigned_t>(value, INT64_MAX)));
  }
  bool number_float(number_float_t value, const string_t& /*text*/) override { return takeTime(value); }
  bool string(string_t& value) override {
    takeText(value);
    return true;
  }
  bool binary(binary_t& /*value*/) override { return true; }
  bool start_object(std::size_t /*size*/) override {
    if (++depth_ == eventsDepth_ + 1 && inEvents_) {
      event_ = {};
      key_.clear();
    }
    return isWithinDepth();
  }
  bool key(string_t& value) override {
    key_ = value;
    return true;
  }
  bool end_object() override {
    if (depth_-- == eventsDepth_ + 1 && inEvents_) return keepEvent();
    return true;
  }
  bool start_array(std::size_t /*size*/) override {
    ++depth_;
    const bool isEvents = depth_ == 1 || (depth_ == 2 && !rootIsArray_ && key_ == "traceEvents");
    if (isEvents && eventsDepth_ == 0) {
      eventsDepth_ = depth_;
      inEvents_ = true;
      rootIsArray_ = depth_ == 1;
    }
    return isWithinDepth();
  }
  bool end_array() override {
    if (depth_-- == eventsDepth_) inEvents_ = false;
    return true;
  }
  bool parse_error(std::size_t position, const std::string& /*token*/, const Json::exception& /*error*/) override {
    failure_ = "it is no whole JSON text: at byte " + std::to_string(position);
    return false;
  }

 private:
  bool isMember() const { return inEvents_ && depth_ == eventsDepth_ + 1; }
  bool isWithinDepth() {
    if (depth_ <= limits_.mostDepth) return true;
    failure_ = "its values nest too deep";
    return false;
  }
  bool takeWhole(std::int64_t value) {
    if (isMember() && key_ == "pid") event_.process = value;
    if (isMember() && key_ == "tid") event_.thread = value;
    return takeTime(static_cast<double>(value));
  }
  bool takeTime(double microseconds) {
    if (!isMember() || !(std::abs(microseconds) <= kMostMicroseconds)) return true;
    const auto nanoseconds = static_cast<std::int64_t>(std::llround(microseconds * 1000));
    if (key_ == "ts") {
      event_.time = nanoseconds;
      event_.hasTime = true;
    } else if (key_ == "dur") {
      event_.duration = nanoseconds;
      event_.hasDuration = true;
    }
    return true;
  }
  void takeText(const std::string& text) {
    if (!isMember()) return;
    if (key_ == "ph") {
      event_.phase = text.size() == 1 ? text[0] : '\0';
    } else if (key_ == "name") {
      event_.name = texts_.number(text);
      event_.hasName = true;
    } else if (key_ == "cat") {
      event_.subsystem = texts_.number(std::string_view(text).substr(0, text.find(',')));
      hasSubsystem_ = true;
    }
  }
  bool keepEvent() {
    const bool isComplete = event_.phase == 'X' && event_.hasDuration && event_.duration >= 0 && event_.hasName;
    const bool isPart = (event_.phase == 'B' && event_.hasName) || event_.phase == 'E';
    if (!std::exchange(hasSubsystem_, false)) event_.subsystem = texts_.number({});
    if (!event_.hasTime || !(isComplete || isPart)) return true;
    if (events_.size() >= limits_.mostEvents) {
      failure_ = "it has more than " + std::to_string(limits_.mostEvents) + " events";
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
  std::string key_;
  Event event_;
  std::vector<Event> events_;
  Texts texts_;
  std::string failure_;
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

template <class Input>
ReadTrace parse(Input&& input, const TraceLimits& limits) {
  ReadTrace read;
  Listener listener(limits);
  const bool isWhole = Json::sax_parse(std::forward<Input>(input), &listener);
  if (!isWhole) {
    read.failure = listener.failure().empty() ? "it is no whole JSON text" : listener.failure();
  } else if (!listener.foundEvents()) {
    read.failure = "it has no array of trace events";
  } else {
    read.trace.intervals = intervalsOf(listener.events());
    read.trace.texts = listener.takeTexts();
  }
  return read;
}

ReadTrace systemFailure(int number) {
  return {{}, number, std::generic_category().message(number)};
}

struct Closer {
  void operator()(std::FILE* file) const { static_cast<void>(std::fclose(file)); }
};

}  // namespace

ReadTrace parseTrace(std::string_view bytes, const TraceLimits& limits) {
  if (bytes.size() > limits.mostBytes) return systemFailure(EFBIG);
  return parse(bytes, limits);
}

ReadTrace readTrace(const std::string& path, const TraceLimits& limits) {
  // Not blocking, for the case that somebody put a pipe there.
  const int descriptor = ::open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  if (descriptor < 0) return systemFailure(errno);
  const std::unique_ptr<std::FILE, Closer> file(::fdopen(descriptor, "rb"));
  if (file == nullptr) {
    const int failure = errno;
    ::close(descriptor);
    return systemFailure(failure);
  }
  struct stat status {};
  if (::fstat(descriptor, &status) != 0) return systemFailure(errno);
  if (!S_ISREG(status.st_mode)) return systemFailure(ENODEV);
  if (static_cast<std::uint64_t>(status.st_size) > limits.mostBytes) return systemFailure(EFBIG);
  return parse(file.get(), limits);
}

}  // namespace tarn::trace_analysis
