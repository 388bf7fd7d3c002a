// SPDX-License-Identifier: Apache-2.0
// FileKinds: what lies beside the recorder's database under the same cap, by kinds: the share of the cap that each has,
// and how old its files get. Plain data. Threads: any.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

namespace tarn::recorder {

// Days, on the recorder's own time and from when it first saw a file.
struct FileMaxAges {
  double setAside = 90;
  double summaryFiles = 120;
  double traces = 30;
  double perfData = 120;
  bool operator==(const FileMaxAges&) const = default;
};

struct FileKind {
  std::string name;
  std::filesystem::path folder;
  // Its names end so, or with `isRest` the names of all files that no other kind of the folder has.
  std::string suffix;
  bool isRest = false;
  // Of 32 parts of the cap.
  std::int64_t share = 0;
  double maxAgeDays = 0;
  bool operator==(const FileKind&) const = default;
};

// Those that the service writes below the folder of its diagnostic logs.
std::vector<FileKind> diagnosticFileKinds(const std::filesystem::path& logs, const FileMaxAges& ages);

}  // namespace tarn::recorder
