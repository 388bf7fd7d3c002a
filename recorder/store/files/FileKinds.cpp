// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/files/FileKinds.h"

namespace tarn::recorder {

std::vector<FileKind> diagnosticFileKinds(const std::filesystem::path& logs, const FileMaxAges& ages) {
  return {{"summary file", logs / "Reporting", "", true, 4, ages.summaryFiles},
          {"trace", logs / "Traces", ".json", false, 3, ages.traces},
          {"perf-data file", logs / "Traces", "", true, 1, ages.perfData}};
}

}  // namespace tarn::recorder
