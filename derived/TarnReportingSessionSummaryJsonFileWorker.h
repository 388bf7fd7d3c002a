// TarnReportingSessionSummaryJsonFileWorker: shows a whole session in one file. When the session stops, every message
// of its log that is not redundant, derived ones included, is written into a JSON array in the audio diagnostic-logs
// directory; for inspection on test devices and internal ones.
//
// The file is written message by message: no more than one message's text is held, and each is in the file before the
// next is formed. A message with a value that JSON can't hold is left out. When the disk refuses, what was written so
// far stays, nothing more is written to that file, and the session ends as usual.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/FileSystem.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

class TarnReportingSessionSummaryJsonFileWorker : public TarnReportingSessionWorkerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSummaryJsonFileWorker";

  // For sessions of the service type Test, and for all on internal builds; it runs from the beginning.
  static std::unique_ptr<TarnReportingSessionSummaryJsonFileWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Writes the file. Each message that is looked at gets the key "isSessionStarted" ("YES" or "NO"), in place.
  void stop();

 private:
  bool openFile(const TarnReportingSession& session);
  void writeMessages(const TarnReportingSession& session);
  // The line, or the lines of one message, by one write. Whether it could be written.
  bool writeLine(std::string line);
  void closeFile();

  std::string reportPath_;                                    // empty when no file is open
  std::unique_ptr<platform::WritableFile> reportFileHandle_;  // null when no file is open
  bool writeFailed_ = false;                                  // the latest write to the file that is open
};

}  // namespace tarn
