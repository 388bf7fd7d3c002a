// SPDX-License-Identifier: Apache-2.0
// FakeLocalCalendar: a calendar with one offset from UTC all the year; UTC itself until a test says otherwise.
//
// Threads: one at a time.
#pragma once

#include "platform/LocalCalendar.h"

namespace tarn::testing {

class FakeLocalCalendar final : public platform::LocalCalendar {
 public:
  // The interface.
  platform::LocalTime localTime(double epochSeconds) const override;
  std::string format(double epochSeconds, std::string_view pattern) const override;

  // Controls.
  void setSecondsEastOfUtc(int seconds) { secondsEastOfUtc_ = seconds; }

 private:
  int secondsEastOfUtc_ = 0;
};

}  // namespace tarn::testing
