// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakePerfDataWriters.h"

namespace tarn::testing {

class FakePerfDataWriters::Writer final : public platform::PerfDataWriter {
 public:
  Writer(std::shared_ptr<File> file, Status closeError) : file_(std::move(file)), closeError_(std::move(closeError)) {}

  void newValue(std::string_view name, platform::PerfDataUnit, double value) override {
    if (!file_->closed) {
      file_->values.emplace_back(name, value);
    }
  }
  Extension startExtension(std::string_view name) override {
    file_->extensions.push_back({std::string(name), {}, false, file_->values.size()});
    return static_cast<Extension>(file_->extensions.size());
  }
  void stringMember(Extension extension, std::string_view name, std::string_view text) override {
    auto& into = file_->extensions.at(extension - 1);
    if (!into.ended && !file_->closed) {
      into.members.emplace_back(name, text);
    }
  }
  void endExtension(Extension extension) override { file_->extensions.at(extension - 1).ended = true; }
  Status close() override {
    file_->closed = closeError_.ok();
    return closeError_;
  }

 private:
  const std::shared_ptr<File> file_;
  const Status closeError_;
};

FakePerfDataWriters::FakePerfDataWriters() = default;
FakePerfDataWriters::~FakePerfDataWriters() = default;

Result<std::unique_ptr<platform::PerfDataWriter>> FakePerfDataWriters::open(std::string_view path,
                                                                            std::string_view name,
                                                                            std::int32_t resultsVersion,
                                                                            std::uint32_t flags) {
  if (openError_.failed()) return {nullptr, openError_};
  auto file = std::make_shared<File>();
  file->path = path;
  file->name = name;
  file->resultsVersion = resultsVersion;
  file->flags = flags;
  files_.push_back(file);
  return {std::make_unique<Writer>(std::move(file), closeError_), {}};
}

}  // namespace tarn::testing
