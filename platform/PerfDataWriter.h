// PerfDataWriter: writes a perf-data result file, which a performance-test database takes in.
//
// Threads: the server queue; one writer is for one thread at a time. A failure while writing shows at close().
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

enum class PerfDataUnit { Milliseconds };

class PerfDataWriter {
 public:
  // Names an extension of this writer from its start to its end; never 0.
  using Extension = std::uint32_t;

  virtual ~PerfDataWriter() = default;
  // Appends a measurement with this value, in this unit.
  virtual void newValue(std::string_view name, PerfDataUnit unit, double value) = 0;
  // One extension is open at a time.
  virtual Extension startExtension(std::string_view name) = 0;
  // A member of the extension's JSON object, with a text as its value.
  virtual void stringMember(Extension extension, std::string_view name, std::string_view text) = 0;
  // Ends the extension: no member follows.
  virtual void endExtension(Extension extension) = 0;
  // Finishes the file. A writer that is destroyed unclosed leaves no complete file.
  [[nodiscard]] virtual Status close() = 0;
};

class PerfDataWriters {
 public:
  virtual ~PerfDataWriters() = default;
  // Opens a writer on a new file at `path`, replacing what is there. The error's code is the system's error number.
  virtual Result<std::unique_ptr<PerfDataWriter>> open(std::string_view path, std::string_view name,
                                                       std::int32_t resultsVersion, std::uint32_t flags) = 0;
};

}  // namespace tarn::platform
