// SPDX-License-Identifier: Apache-2.0
// LinuxPerfDataWriters: perf-data files as JSON.
//
//   {
//     "name": "TarnReporting",
//     "results_version": 4,
//     "values": [
//       {"name": "messages", "unit": "ms", "value": 1.25},
//       {"name": "messages Total", "unit": "ms", "value": 1.25}
//     ],
//     "extensions": [
//       {"name": "@tdg-perf.key_variables", "members": {"messages": "[]"}}
//     ]
//   }
//
// Values and extensions stand in the order in which they were written. A value that is not finite is the text "nan",
// "inf" or "-inf"; a text that is not UTF-8 is mended. The file is written beside its place, values as they come, and
// takes its place at close() when it is whole and on the disk; until then, and when that fails, what is there stays.
//
// Threads: open on any; a writer for one at a time.
#pragma once

#include <atomic>

#include "platform/PerfDataWriter.h"

namespace tarn::linux_host {

class LinuxPerfDataWriters final : public platform::PerfDataWriters {
 public:
  LinuxPerfDataWriters() = default;
  LinuxPerfDataWriters(const LinuxPerfDataWriters&) = delete;
  LinuxPerfDataWriters& operator=(const LinuxPerfDataWriters&) = delete;

  // Makes the file beside its place ("PATH.PROCESS.NUMBER"); its folder must be there. There are no flags: with any the
  // error is EINVAL. Every later failure, of a full disk too, shows at the writer's close().
  Result<std::unique_ptr<platform::PerfDataWriter>> open(std::string_view path, std::string_view name,
                                                         std::int32_t resultsVersion, std::uint32_t flags) override;

 private:
  std::atomic<unsigned> opened_ = 0;  // so that no two writers share a name
};

}  // namespace tarn::linux_host
