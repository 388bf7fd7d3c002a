// SPDX-License-Identifier: Apache-2.0
// FolderPublisher: keeps messages as files of a folder of this machine, ID.tnf each, for who carries them on or only
// wants to see. A full folder refuses until somebody takes files away. Threads: one.
#pragma once

#include <cstdint>
#include <filesystem>
#include <string>
#include <vector>

#include "fleet/publish/Publisher.h"

namespace tarn::fleet {

class FolderPublisher final : public Publisher {
 public:
  // The folder is made when it is needed. `most`: bytes of all files in it.
  FolderPublisher(std::filesystem::path folder, std::int64_t most) : folder_(std::move(folder)), most_(most) {}

  [[nodiscard]] Status publish(std::uint64_t number, const std::string& id, const std::string& bytes) override;
  void wait(std::chrono::milliseconds longest, std::vector<Outcome>& outcomes) override;

 private:
  // What is in the folder.
  std::int64_t measure() const;

  const std::filesystem::path folder_;
  const std::int64_t most_;
  std::int64_t bytes_ = -1;  // not measured yet
  std::vector<Outcome> outcomes_;
};

}  // namespace tarn::fleet
