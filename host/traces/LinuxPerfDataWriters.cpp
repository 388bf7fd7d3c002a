// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxPerfDataWriters.h"

#include <fcntl.h>
#include <unistd.h>

#include <string>
#include <utility>

#include "host/system/FileReplacement.h"
#include "host/system/SystemError.h"
#include "host/system/UniqueDescriptor.h"
#include "plist/EscapedText.h"
#include "plist/formats/Json.h"
#include "wire/Utf8.h"

namespace tarn::linux_host {

namespace {

constexpr std::size_t kBlockBytes = std::size_t{64} * 1024;
constexpr mode_t kFilePermissions = 0666;  // less the process's mask

void appendText(std::string& out, std::string_view text) {
  if (wire::isUtf8(text)) {
    plist::appendJsonText(out, text);
    return;
  }
  std::string mended;
  wire::appendMendedUtf8(mended, text);
  plist::appendJsonText(out, mended);
}

std::string_view nameOf(platform::PerfDataUnit unit) {
  switch (unit) {
    case platform::PerfDataUnit::Milliseconds:
      return "ms";
  }
  return "";
}

class Writer final : public platform::PerfDataWriter {
 public:
  // The file is open under the name `beside`.
  Writer(UniqueDescriptor file, std::string beside, std::string path, std::string_view name, std::int32_t version)
      : path_(std::move(path)), text_("{\n  \"name\": ") {
    file_.begin(std::move(file), std::move(beside));
    appendText(text_, name);
    text_ += ",\n  \"results_version\": " + std::to_string(version) + ",\n  \"values\": [";
  }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;

  void newValue(std::string_view name, platform::PerfDataUnit unit, double value) override {
    text_ += std::exchange(hasValues_, true) ? ",\n    {\"name\": " : "\n    {\"name\": ";
    appendText(text_, name);
    text_.append(R"(, "unit": ")").append(nameOf(unit)).append(R"(", "value": )");
    plist::appendJson(text_, value);
    text_ += '}';
    if (text_.size() >= kBlockBytes) {
      flush();
    }
  }

  // Values may still come, so extensions wait for their turn.
  Extension startExtension(std::string_view name) override {
    extensions_ += extensionCount_ == 0 ? "\n    {\"name\": " : ",\n    {\"name\": ";
    appendText(extensions_, name);
    extensions_ += ", \"members\": {";
    hasMembers_ = false;
    open_ = ++extensionCount_;
    return open_;
  }
  void stringMember(Extension extension, std::string_view name, std::string_view text) override {
    if (extension != open_ || open_ == 0) return;
    if (std::exchange(hasMembers_, true)) {
      extensions_ += ", ";
    }
    appendText(extensions_, name);
    extensions_ += ": ";
    appendText(extensions_, text);
  }
  void endExtension(Extension extension) override {
    if (extension != open_ || open_ == 0) return;
    extensions_ += "}}";
    open_ = 0;
  }

  Status close() override {
    if (!file_.isOpen()) return systemError(EBADF);
    endExtension(open_);
    text_ += hasValues_ ? "\n  ],\n  \"extensions\": [" : "],\n  \"extensions\": [";
    text_ += std::exchange(extensions_, {});
    text_ += extensionCount_ > 0 ? "\n  ]\n}\n" : "]\n}\n";
    flush();
    return file_.takePlace(path_);
  }

 private:
  void flush() {
    file_.write(text_);
    text_.clear();
  }

  FileReplacement file_;
  const std::string path_;
  std::string text_;  // not written yet
  bool hasValues_ = false;
  std::string extensions_;
  Extension extensionCount_ = 0;
  Extension open_ = 0;
  bool hasMembers_ = false;  // of the open extension
};

}  // namespace

Result<std::unique_ptr<platform::PerfDataWriter>> LinuxPerfDataWriters::open(std::string_view path,
                                                                             std::string_view name,
                                                                             std::int32_t resultsVersion,
                                                                             std::uint32_t flags) {
  if (flags != 0) return {nullptr, systemError(EINVAL)};
  std::string place(path);
  std::string beside = place + "." + std::to_string(::getpid()) + "." + std::to_string(++opened_);
  ::unlink(beside.c_str());  // what an earlier process of this number left
  UniqueDescriptor file(::open(beside.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kFilePermissions));
  if (!file) return {nullptr, lastSystemError()};
  return {std::make_unique<Writer>(std::move(file), std::move(beside), std::move(place), name, resultsVersion), {}};
}

}  // namespace tarn::linux_host
