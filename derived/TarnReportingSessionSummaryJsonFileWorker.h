// SPDX-License-Identifier: Apache-2.0
// TarnReportingSessionSummaryJsonFileWorker: shows a whole session in one file. When the session stops, every message
// of its log that is not redundant, derived ones included, is written into a JSON array in the audio diagnostic-logs
// directory; for inspection on test devices and internal ones.
//
// The file is written message by message: no more than one message's text is held, and each is in the file before the
// next is formed. A message with a value that JSON can't hold is left out. When the disk refuses, what was written so
// far stays, nothing more is written to that file, and the session ends as usual.
//
// The file is named "yyyyMMdd-HHmmssZ-ID-application-service.json" in local time, or with "-2", "-3" and so on where a
// file of that second is there. A message is an object under "Category_Type_N", N counting from 1 for each pair.
//
// Owner: the session. Threads: the server queue, which waits for the disk: test sessions and internal devices bear
// that.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/FileSystem.h"
#include "session/TarnReportingSessionWorker.h"

namespace tarn {

// Neither consumer nor producer, so it stops last and finds what the producers derived in the log.
class TarnReportingSessionSummaryJsonFileWorker : public TarnReportingSessionWorkerProtocol {
 public:
  static constexpr std::string_view kClassName = "TarnReportingSessionSummaryJsonFileWorker";

  // For sessions of the service type Test, and for all on internal builds; it runs from the beginning.
  static std::unique_ptr<TarnReportingSessionSummaryJsonFileWorker> initWithSession(
      const std::shared_ptr<TarnReportingSession>& session);
  using TarnReportingSessionWorkerProtocol::TarnReportingSessionWorkerProtocol;

  // Writes the file. Each message that is looked at gets the key "isSessionStarted" ("YES" or "NO"), in place. A log
  // without messages makes no file. Each failure has an error line; nothing of it is tried again before the next stop.
  void stop();

 private:
  // Makes the directory and a file of its own and begins the array. Whether that went well; if not, the worker doesn't
  // count as running until the session's next start.
  bool openFile(const TarnReportingSession& session);
  // The file is opened with the first message that isn't redundant.
  void writeMessages(const TarnReportingSession& session);
  // The line, or the lines of one message, by one write. Whether it could be written.
  bool writeLine(std::string line);
  // Ends the array, unless a write failed: after a gap the rest would be worth nothing. Nothing happens without a file.
  void closeFile();

  std::string reportPath_;                                    // empty when no file is open
  std::unique_ptr<platform::WritableFile> reportFileHandle_;  // null when no file is open
  bool writeFailed_ = false;                                  // the latest write to the file that is open
};

}  // namespace tarn
