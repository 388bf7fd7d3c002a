// LinuxLocalCalendar: the machine's time zone, as TZ or /etc/localtime tells it when the calendar is made and whenever
// the C library looks again. Threads: any.
#pragma once

#include "platform/LocalCalendar.h"

namespace tarn::linux_host {

class LinuxLocalCalendar final : public platform::LocalCalendar {
 public:
  LinuxLocalCalendar();

  platform::LocalTime localTime(double epochSeconds) const override;
  std::string format(double epochSeconds, std::string_view pattern) const override;
};

}  // namespace tarn::linux_host
