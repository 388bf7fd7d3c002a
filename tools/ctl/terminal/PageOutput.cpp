// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/terminal/PageOutput.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "host/system/FileReplacement.h"
#include "host/system/Files.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"
#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {

namespace {

// A file is replaced whole, so that nobody reads half a page; a pipe or a device is written to as it is.
Status writePage(const std::string& path, const std::string& page) {
  struct stat there {};
  if (::stat(path.c_str(), &there) == 0 && !S_ISREG(there.st_mode)) {
    const linux_host::UniqueDescriptor file(::open(path.c_str(), O_WRONLY | O_CLOEXEC));
    if (!file) return linux_host::lastSystemError();
    return linux_host::writeAll(file.get(), page);
  }
  return linux_host::replaceFile(path, path + "." + std::to_string(::getpid()) + ".tmp", page);
}

int printPage(const std::string& page) {
  if (::isatty(STDOUT_FILENO) == 1) {
    complain("the report is a page for a browser: name its file with -o, or send it to a program");
    return kWrongUsage;
  }
  const Status written = linux_host::writeAll(STDOUT_FILENO, page);
  if (written.ok() || written->code == EPIPE) return kSuccess;
  complain("can't write the report: " + written->text);
  return kFailure;
}

}  // namespace

int putPage(const std::string& file, const std::string& page) {
  if (file.empty() || file == "-") return printPage(page);
  if (const Status written = writePage(file, page); written.failed()) {
    complain("can't write the report to " + file + ": " + written->text);
    return kFailure;
  }
  return kSuccess;
}

}  // namespace tarn::ctl
