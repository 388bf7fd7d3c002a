// SPDX-License-Identifier: Apache-2.0
// PerfDataWriter: writes a perf-data result file, which a performance-test database takes in.
//
// Threads: the server queue; one writer is for one thread at a time. A failure while writing shows at close().
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

// Units of measurements, by the names that the database knows ("ms").
enum class PerfDataUnit { Milliseconds };

// One result file, from open() to close(). Order: values and extensions may come mixed, and each is written in the
// order of its kind. Texts are UTF-8; bytes that aren't are mended.
class PerfDataWriter {
 public:
  // Names an extension of this writer from its start to its end; never 0.
  using Extension = std::uint32_t;

  virtual ~PerfDataWriter() = default;
  // Appends a measurement with this value, in this unit. Names may come more than once: each is a sample of its own.
  virtual void newValue(std::string_view name, PerfDataUnit unit, double value) = 0;
  // One extension is open at a time. Its members end up under its name in the file.
  virtual Extension startExtension(std::string_view name) = 0;
  // A member of the extension's JSON object, with a text as its value. An extension that isn't the open one is ignored,
  // here and below.
  virtual void stringMember(Extension extension, std::string_view name, std::string_view text) = 0;
  // Ends the extension: no member follows.
  virtual void endExtension(Extension extension) = 0;
  // Finishes the file, an open extension included, and puts it into its place. An error is the first since the opening;
  // then there is no file. A writer that is destroyed unclosed leaves no complete file either.
  [[nodiscard]] virtual Status close() = 0;
};

// Owned by the platform, which may lack it.
class PerfDataWriters {
 public:
  virtual ~PerfDataWriters() = default;
  // Opens a writer on a new file at `path`, replacing what is there once it is closed. `name` is that of the test, the
  // version that of its results' meaning; flags other than 0 stand for nothing that there is, and are refused. The
  // error's code is the system's error number.
  virtual Result<std::unique_ptr<PerfDataWriter>> open(std::string_view path, std::string_view name,
                                                       std::int32_t resultsVersion, std::uint32_t flags) = 0;
};

}  // namespace tarn::platform
