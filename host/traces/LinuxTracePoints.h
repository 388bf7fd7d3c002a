// SPDX-License-Identifier: Apache-2.0
// LinuxTracePoints: each mark is a USDT probe of the provider "tarnkit", where the program was built with sys/sdt.h,
// and a mark in the performance traces that record. A probe that nobody is attached to is one instruction that does
// nothing.
//
// Owner: the platform. Threads: any; nothing is allocated, and no lock is taken while no trace records.
#pragma once

#include <string_view>

#include "platform/Signposts.h"
#include "platform/TracePoints.h"

namespace tarn::linux_host {

class LinuxTracePoints final : public platform::TracePoints {
 public:
  // The signposts outlive this.
  explicit LinuxTracePoints(platform::Signposts& signposts) : signposts_(signposts) {}

  // `code` says what happened (session_started, operation_send, ...), `argument` to whom or how much. A code without a
  // probe of its own fires the probe "other" with code and argument.
  void emit(std::uint32_t code, std::int64_t argument) noexcept override;

  // The name of a code's probe, as it stands in traces too; "other" for codes that have none.
  static std::string_view probeName(std::uint32_t code) noexcept;

 private:
  platform::Signposts& signposts_;
};

}  // namespace tarn::linux_host
