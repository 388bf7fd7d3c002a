// SPDX-License-Identifier: Apache-2.0
// A temporary directory with expectations in it, and events that arrive.
#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <utility>
#include <vector>

#include "tests/scenario/Expectations.h"
#include "tests/scenario/Notation.h"
#include "tests/scenario/Recorded.h"

namespace tarn::scenario {

using Differences = std::vector<std::string>;

class ScenarioFixture : public ::testing::Test {
 public:
  ~ScenarioFixture() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

 protected:
  ScenarioFixture() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) {
      directory_ = name;
    }
  }

  std::string script(const std::string& name) const { return directory_ + "/" + name + ".jsonl"; }
  // What stands beside a script of this name.
  std::vector<ExpectedEvent> beside(const std::string& name, const std::string& lines) {
    std::ofstream(expectationFile(script(name))) << lines;
    return readExpectations(script(name));
  }
  void arrives(const std::string& backend, const std::string& name, json payload = json::object(),
               json detail = json::object()) {
    const auto id = static_cast<std::int64_t>(events_.size()) + 1;
    events_.push_back({id, backend, name, std::move(payload), std::move(detail)});
  }
  static void expectOneOf(const Differences& found, const std::string& part) {
    EXPECT_TRUE(std::any_of(found.begin(), found.end(), [&](const std::string& text) {
      return text.find(part) != std::string::npos;
    })) << json(found).dump(1);
  }

  const Playing playing_{1000, 1010};
  std::string directory_;
  std::vector<RecordedEvent> events_;
};

}  // namespace tarn::scenario
