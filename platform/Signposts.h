// SPDX-License-Identifier: Apache-2.0
// Signposts: tell a performance trace what the service does: intervals with a begin and an end, and single marks.
//
// While nothing records, whoever sets a signpost pays for one look at the switch: it is kept outside the virtual
// operations, so that no call is made, no clock is read and nothing is formed. What is recorded belongs to the
// subsystem "sys.oxbow.tarnkit".
//
// Texts in a signpost must be static: names are kept as they are and read later. Threads: any. Nothing fails: what
// a recorder can't take it counts by itself.
#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <string_view>

namespace tarn::platform {

// Under which traces list what the service tells, and by which probes ask for it.
inline constexpr std::string_view kSignpostSubsystem = "sys.oxbow.tarnkit";

// Which kind of work a signpost tells of.
enum class SignpostCategory : std::uint8_t {
  Operation,   // a remote operation, on the server queue
  Message,     // the intake of a message by one session
  Worker,      // a worker's start, stop or handling of a message
  BackEnd,     // a hand-over to a back-end
  TracePoint,  // a mark by its code
};

// A small number that goes with a signpost; none while it has no name. Its name is a static text.
struct SignpostArgument {
  std::string_view name;
  std::int64_t value = 0;
};

// Its name in a trace is "subject.verb".
struct Signpost {
  SignpostCategory category = SignpostCategory::Operation;
  // Both are static texts, joined when the trace is written.
  std::string_view subject;  // whose work it is
  std::string_view verb;     // what is done
  SignpostArgument argument{};
};

// Owned by the platform; null where nothing ever records. Most signposts are set by TarnReportingSignpost, which asks
// the switch and keeps the moment; these are what it stands on.
class Signposts {
 public:
  Signposts() = default;
  Signposts(const Signposts&) = delete;
  Signposts& operator=(const Signposts&) = delete;
  virtual ~Signposts() = default;

  // Whether anything records; it may change at any moment, so an interval may begin without a recorder and end with
  // one. One load, without order.
  bool isRecording() const noexcept { return recording_.load(std::memory_order_relaxed); }
  // The same for those who keep the way short; it lives as long as this.
  const std::atomic<bool>& recordingSwitch() const noexcept { return recording_; }

  // Begins an interval: the moment on the monotonic clock, to be handed to end(). Only while something records.
  virtual std::chrono::nanoseconds begin() noexcept = 0;
  // Ends the interval that began at that moment, on the thread where it began. Recorded by whoever recorded all of it:
  // a recorder that came later leaves it out.
  virtual void end(const Signpost& signpost, std::chrono::nanoseconds began) noexcept = 0;
  // A mark of this moment, without a length.
  virtual void mark(const Signpost& signpost) noexcept = 0;

 protected:
  // By the recorder, when the first trace begins and when the last one has ended.
  void setRecording(bool recording) noexcept { recording_.store(recording, std::memory_order_relaxed); }

 private:
  std::atomic<bool> recording_{false};
};

}  // namespace tarn::platform
