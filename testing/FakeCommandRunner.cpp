// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeCommandRunner.h"

#include <algorithm>
#include <utility>

namespace tarn::testing {

struct FakeCommandRunner::Ledger : Recorded {
  using Recorded::happened;

  std::mutex mutex;
  std::map<std::string, Tool, std::less<>> tools;
  std::vector<Run> runs;
};

class FakeCommandRunner::Running final : public platform::RunningCommand {
 public:
  Running(std::shared_ptr<Ledger> ledger, std::size_t run, Tool tool)
      : ledger_(std::move(ledger)), run_(run), tool_(std::move(tool)) {}

  std::optional<std::string> readLine(std::size_t mostBytes) override {
    if (at_ == tool_.output.size() || mostBytes == 0) return std::nullopt;
    const auto newline = tool_.output.find('\n', at_);
    const auto whole = newline == std::string::npos ? tool_.output.size() - at_ : newline + 1 - at_;
    auto line = tool_.output.substr(at_, std::min(whole, mostBytes));
    at_ += line.size();
    return line;
  }

  platform::CommandEnd close() override {
    const std::lock_guard lock(ledger_->mutex);
    ledger_->happened("close", ledger_->runs[run_].commandText);
    ledger_->runs[run_].closed = true;
    return tool_.end;
  }

 private:
  const std::shared_ptr<Ledger> ledger_;
  const std::size_t run_;
  const Tool tool_;
  std::size_t at_ = 0;
};

FakeCommandRunner::FakeCommandRunner() : ledger_(std::make_shared<Ledger>()) {}
FakeCommandRunner::~FakeCommandRunner() = default;

Result<std::unique_ptr<platform::RunningCommand>> FakeCommandRunner::start(std::string_view commandText,
                                                                           std::chrono::nanoseconds timeLimit) {
  ledger_->happened("run", commandText);
  const std::lock_guard lock(ledger_->mutex);
  const auto found = ledger_->tools.find(commandText);
  Tool tool;
  if (found != ledger_->tools.end()) {
    tool = found->second;
  } else {
    tool.end.status = platform::CommandEnd::kNotFound;
  }
  if (tool.refusal.failed()) return {nullptr, tool.refusal};
  ledger_->runs.push_back({std::string(commandText), timeLimit, false});
  return {std::make_unique<Running>(ledger_, ledger_->runs.size() - 1, std::move(tool)), {}};
}

void FakeCommandRunner::recordOrderIn(OrderRecord& record) {
  ledger_->recordOrderIn(record);
}

void FakeCommandRunner::describe(std::string_view commandText, Tool tool) {
  const std::lock_guard lock(ledger_->mutex);
  ledger_->tools.insert_or_assign(std::string(commandText), std::move(tool));
}

void FakeCommandRunner::describeHanging(std::string_view commandText, std::string_view output) {
  describe(commandText, {std::string(output), {platform::CommandEnd::Kind::TimedOut, 0}, {}});
}

std::vector<FakeCommandRunner::Run> FakeCommandRunner::runs() const {
  const std::lock_guard lock(ledger_->mutex);
  return ledger_->runs;
}

}  // namespace tarn::testing
