// SPDX-License-Identifier: Apache-2.0
// LinuxLocalCalendar: the machine's time zone, as TZ or /etc/localtime tells it when the calendar is made and whenever
// the C library looks again. Threads: any.
#pragma once

#include "platform/LocalCalendar.h"

namespace tarn::linux_host {

class LinuxLocalCalendar final : public platform::LocalCalendar {
 public:
  // Reads the zone now, so that the first report doesn't.
  LinuxLocalCalendar();

  // What is no number counts as 1970; a day at each end of the years 1 to 9999 is given up, so that the year stays in
  // them in every zone.
  platform::LocalTime localTime(double epochSeconds) const override;
  // Read from left to right; a letter that begins no field stands for itself. No locale is looked at.
  std::string format(double epochSeconds, std::string_view pattern) const override;
};

}  // namespace tarn::linux_host
