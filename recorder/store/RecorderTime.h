// SPDX-License-Identifier: Apache-2.0
// RecorderTime: how many seconds have truly passed while there were recorders on a file, through restarts and whatever
// anybody does to the wall clock.
//
// Which problem: events must go when they are too old, and a wall clock that is set, or that begins in 1970, makes them
// as old as it likes. How: the table recorder_times(sequence, boot, monotonic, wall, elapsed, hash) has a row for each
// boot of the system, which ties its monotonic clock to the seconds that had passed. Between two boots nothing is known
// to have passed but the new one's uptime, so time never goes faster here than it did; a device that was off for long
// keeps its events for longer. The wall clock stands beside it for people.
//
// Threads: those of the file.
#pragma once

#include <string>
#include <utility>

#include "platform/Clock.h"
#include "plist/Result.h"
#include "recorder/store/rows/Connection.h"

namespace tarn::recorder {

class RecorderTime {
 public:
  // `boot` tells this boot of the system from others; the clock outlives this.
  RecorderTime(const platform::Clock& clock, std::string boot) : clock_(clock), boot_(std::move(boot)) {}

  // Goes on from what the file has noted, and notes where it does; outside any transaction. With another file it goes
  // on all the same: the time of this object is never set back. An error is the file's.
  [[nodiscard]] Status open(Connection& connection);
  // Since the file's first recorder began. Never goes back. After open().
  double seconds() const noexcept;

  // The kernel's own name for this boot; empty when it doesn't tell.
  static std::string currentBoot();

 private:
  // What the file's last row of times tells, as far as its checksum says that it may.
  struct Noted {
    bool sameBoot = false;
    double seconds = 0;  // that had passed when it was noted, or until now when it is of this boot
  };

  [[nodiscard]] Result<Noted> readNoted(Connection& connection) const;
  // Adds a row, and forgets all but the last hundred.
  [[nodiscard]] Status note(Connection& connection) const;
  double monotonic() const noexcept;

  const platform::Clock& clock_;
  const std::string boot_;
  double base_ = 0;  // seconds() less the monotonic clock
  // Whether base_ is known: from the first file on.
  bool begun_ = false;
};

}  // namespace tarn::recorder
