// SPDX-License-Identifier: Apache-2.0
// FakeCommandRunner: tools whose output a test wrote down. A command that nobody described is not found, as the shell
// would answer.
//
// Threads: any; commands may run on several at once.
#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/CommandRunner.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeCommandRunner final : public platform::CommandRunner {
 public:
  struct Tool {
    std::string output;
    platform::CommandEnd end;
    Status refusal;  // the command can't be started at all
  };
  struct Run {
    std::string commandText;
    std::chrono::nanoseconds timeLimit{};
    bool closed = false;
  };

  FakeCommandRunner();
  ~FakeCommandRunner() override;
  FakeCommandRunner(const FakeCommandRunner&) = delete;
  FakeCommandRunner& operator=(const FakeCommandRunner&) = delete;

  // The interface.
  Result<std::unique_ptr<platform::RunningCommand>> start(std::string_view commandText,
                                                          std::chrono::nanoseconds timeLimit) override;

  // Controls.
  void recordOrderIn(OrderRecord& record);
  void describe(std::string_view commandText, Tool tool);
  // The tool prints this and hangs until its time is up. No time passes in the test.
  void describeHanging(std::string_view commandText, std::string_view output);

  // Observations.
  std::vector<Run> runs() const;  // in the order of the starts

 private:
  class Running;
  struct Ledger;

  const std::shared_ptr<Ledger> ledger_;
};

}  // namespace tarn::testing
