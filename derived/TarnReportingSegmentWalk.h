// SPDX-License-Identifier: Apache-2.0
// TarnReportingSegmentWalk: cuts the time during which a session's output (or input) ran into segments, at every change
// that counts, and makes a message of each segment that was long enough.
//
//   running           ____________________
//   messages    ... | on | ... | change | ... | off | ...
//   segments         <--------><-------------->
//
// What differs from worker to worker are its `Rules`, a class with
//
//   Field                                 // see TarnReportingMessageFields; has Timestamp, Running and Duration
//   static const Fields::Keys& keys();
//   static constexpr TarnReportingLogger kLog;                                // the worker's, and what it logs there:
//   static constexpr std::string_view kOperation;
//   static constexpr LogText kLength, kAdded, kSkipped;
//   static Fields initialState(const TarnReportingSessionPreviousValues&);
//   bool cuts(const Fields& message, const Fields& state);  // whether the message ends a segment; asked while it runs
//   bool suffices(const Fields& state) const;               // whether a message can be made of a segment
//   MessagePointer makeMessage(const TarnReportingSegment<Field>&);
//
// Threads: the server queue.
//
// Output runs from a message that says so to one that says that it no longer does, or that has a duration, with which a
// client closes its session. A message that doesn't mention it changes nothing about it. What is told of a segment are
// the values from before the message that ended it. Times are epoch seconds of the messages, not of their arrival.
#pragma once

#include <cstddef>
#include <memory>
#include <string_view>
#include <utility>

#include "derived/TarnReportingMessageFields.h"
#include "derived/TarnReportingSegments.h"
#include "service/vocabulary/TarnReportingLog.h"
#include "session/TarnReportingSessionMessageList.h"
#include "session/TarnReportingSessionPreviousValues.h"

namespace tarn {

// A segment that has ended. Handed to makeMessage(); what it looks at holds for that call.
template <class Field>
struct TarnReportingSegment {
  const TarnReportingMessageFields<Field>& state;  // while it lasted
  std::string_view process;
  double seconds;
  std::size_t index;  // among the messages that come out, from 1
};

// Used once. One look at each message's fields and, while it runs, one comparison of those that cut; what lasts from
// message to message is the state of those fields alone.
template <class Rules>
class TarnReportingSegmentWalk {
 public:
  using Field = typename Rules::Field;
  using Fields = TarnReportingMessageFields<Field>;

  // `process`: the application's name; nothing comes out when it is empty. Segments of `minimumSeconds` or less are
  // left out. Both `process` and the previous values outlive the walk. The minimum is compared strictly: a segment of
  // exactly so many seconds is left out.
  TarnReportingSegmentWalk(const TarnReportingSessionPreviousValues& previousValues, std::string_view process,
                           double minimumSeconds)
      : process_(process), minimumSeconds_(minimumSeconds), state_(Rules::initialState(previousValues)) {}

  // The next message in order of time. Its changes count only while it runs and has run before: what a message that
  // starts it says is the first segment's state.
  void take(const plist::Dictionary& payload) {
    const Fields message = reader_.read(payload);
    const plist::ValueView& time = message[Field::Timestamp];
    const bool wasRunning = state_[Field::Running].asBool();
    const bool hasEnd = message[Field::Duration].present();
    bool changed = hasEnd;
    if (const plist::ValueView& running = message[Field::Running]) {
      running_ = running.asBool();
      if (running_ && !wasRunning) {
        clock_.startAt(time);
      }
      changed = changed || !running_;
    } else {
      running_ = running_ && !hasEnd;
    }
    if (running_ && rules_.cuts(message, state_)) {
      changed = true;
    }
    if (wasRunning && changed) {
      endSegment(time);
    }
    if (!running_) {
      clock_.clear();
    }
    state_.merge(message);
  }

  // What was taken so far may go.
  void keep() {
    state_.keepIn(kept_);
    clock_.keep();
  }

  // The messages in the order of their segments, each with its index and how many there are. What still runs at the end
  // of the log makes none.
  TarnReportingSessionMessageList finish() {
    TarnReportingNumberMessages(derived_);
    // A list is made, which may fail, and then moved into: making one of another can't tell that there was no memory.
    TarnReportingSessionMessageList finished;
    finished = std::move(derived_);
    return finished;
  }

 private:
  // Ends the segment at `time`, where the next one begins. The state is still that of the segment. Without a time stamp
  // here or at its beginning a segment is left out. The lines are at debug level: the length, then whether a message
  // was added.
  void endSegment(const plist::ValueView& time) {
    const double seconds = clock_.secondsUntil(time);
    Rules::kLog(LogLevel::Debug, Rules::kLength, Rules::kOperation, seconds, time, time.asDouble(), clock_.start(),
                clock_.start().asDouble());
    const bool isTold =
        time.present() && clock_.started() && seconds > minimumSeconds_ && rules_.suffices(state_) && !process_.empty();
    if (isTold) {
      derived_.append(rules_.makeMessage({state_, process_, seconds, derived_.size() + 1}));
    }
    Rules::kLog(LogLevel::Debug, isTold ? Rules::kAdded : Rules::kSkipped, Rules::kOperation, derived_.size());
    clock_.startAt(time);
  }

  const std::string_view process_;
  const double minimumSeconds_;
  // A walk's own, as rules may gather things from message to message.
  Rules rules_;
  TarnReportingMessageFieldReader<Field> reader_{Rules::keys()};
  // The values before the message that is looked at; `kept_` holds them where the payloads that they lay in have gone.
  Fields state_;
  typename Fields::Kept kept_;
  bool running_ = false;
  TarnReportingSegmentClock clock_;
  TarnReportingSessionMessageList derived_;
};

}  // namespace tarn
