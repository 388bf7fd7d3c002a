// SPDX-License-Identifier: Apache-2.0
// FakePerfDataWriters: result files as lists of what was written. Threads: one at a time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/PerfDataWriter.h"

namespace tarn::testing {

class FakePerfDataWriters final : public platform::PerfDataWriters {
 public:
  struct Extension {
    std::string name;
    std::vector<std::pair<std::string, std::string>> members;
    bool ended = false;
    std::size_t valuesBefore = 0;  // that were written before it began
  };
  struct File {
    std::string path;
    std::string name;
    std::int32_t resultsVersion = 0;
    std::uint32_t flags = 0;
    std::vector<std::pair<std::string, double>> values;  // in milliseconds
    std::vector<Extension> extensions;
    bool closed = false;
  };

  FakePerfDataWriters();
  ~FakePerfDataWriters() override;
  FakePerfDataWriters(const FakePerfDataWriters&) = delete;
  FakePerfDataWriters& operator=(const FakePerfDataWriters&) = delete;

  // The interface.
  Result<std::unique_ptr<platform::PerfDataWriter>> open(std::string_view path, std::string_view name,
                                                         std::int32_t resultsVersion, std::uint32_t flags) override;

  // Controls. An error of nothing means success.
  void failOpen(Status error) { openError_ = std::move(error); }
  void failClose(Status error) { closeError_ = std::move(error); }

  // Observations.
  const std::vector<std::shared_ptr<const File>>& files() const noexcept { return files_; }

 private:
  class Writer;

  Status openError_;
  Status closeError_;
  std::vector<std::shared_ptr<const File>> files_;
};

}  // namespace tarn::testing
