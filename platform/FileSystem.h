// SPDX-License-Identifier: Apache-2.0
// FileSystem: the few files that the system writes and reads by itself. Paths are absolute.
//
// Threads: any; one open file is for one thread at a time. Calls take as long as the disk does.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "plist/Result.h"

namespace tarn::platform {

// A file that is open for writing, from its beginning on. Destroying it closes it and drops the result, so whoever
// wants to know calls close().
class WritableFile {
 public:
  virtual ~WritableFile() = default;
  // Appends the bytes. They are in the file when it returns; after an error some may be. Each call goes to the disk by
  // itself, so whoever has many small pieces joins them.
  [[nodiscard]] virtual Status write(std::string_view bytes) = 0;
  // Closes; an error may belong to an earlier write, which the disk carried out later. The file is closed afterwards,
  // whatever the result; later calls fail.
  [[nodiscard]] virtual Status close() = 0;
};

// Places that the platform chooses.
enum class WellKnownDirectory {
  DiagnosticLogs,  // the device user's diagnostic logs; its last component is "DiagnosticLogs"
  Temporary,       // this process's own files that nobody needs after it
};

// Errors have the system's number and text. Paths that name a link at their end are not followed where something is
// written.
class FileSystem {
 public:
  virtual ~FileSystem() = default;
  // The directory's path, without a slash at its end. It need not exist yet.
  virtual std::string wellKnownDirectory(WellKnownDirectory which) const = 0;
  // Makes the directory and what is missing above it, each with these permissions less the process's mask. One that is
  // there already is left as it is, and that is a success.
  [[nodiscard]] virtual Status createDirectories(std::string_view path, std::uint32_t permissions) = 0;
  // Makes an empty file; fails when there is something at the path or no directory for it.
  [[nodiscard]] virtual Status createFile(std::string_view path) = 0;
  // Opens a file that exists, and empties it; the pointer is null just when that failed.
  virtual Result<std::unique_ptr<WritableFile>> openForWriting(std::string_view path) = 0;
  // The whole content of a file, bytes as they are; fails when it is larger than `mostBytes`, and is empty then.
  virtual Result<std::string> readFile(std::string_view path, std::size_t mostBytes) = 0;
  // Whether there is something at the path; false also when that can't be found out.
  virtual bool exists(std::string_view path) const = 0;
  // Moves a file, onto another file system too, replacing what is there; never leaves half a file at `to`. After an
  // error the file is where it was, or in both places when only its removal failed.
  [[nodiscard]] virtual Status moveFile(std::string_view from, std::string_view to) = 0;
};

}  // namespace tarn::platform
