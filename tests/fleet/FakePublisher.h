// SPDX-License-Identifier: Apache-2.0
// FakePublisher: a server in memory, with the faults of real ones. It keeps what it was sent by id, as a stream does
// that drops repeats.
#pragma once

#include <algorithm>
#include <map>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "fleet/publish/Publisher.h"

namespace tarn::testing {

class FakePublisher final : public fleet::Publisher {
 public:
  explicit FakePublisher(std::uint64_t seed = 1) : random_(seed) {}

  // The interface.
  [[nodiscard]] Status publish(std::uint64_t number, const std::string& id, const std::string& bytes) override {
    ++tries_;
    if (isDown_) return Error{0, "down"};
    if (happens(refuses)) {
      if (happens(0.5)) return Error{0, "refused"};
      outcomes_.push_back({number, Error{0, "refused later"}});
      return {};
    }
    if (happens(loses)) return {};
    const auto [kept, isNew] = messages_.emplace(id, bytes);
    repeats_ += isNew ? 0 : 1;
    if (kept->second != bytes) {
      ++changed_;
    }
    order_.push_back(number);
    if (happens(losesAnswers)) return {};
    outcomes_.push_back({number, {}});
    return {};
  }
  void wait(std::chrono::milliseconds, std::vector<fleet::Outcome>& outcomes) override {
    if (isSilent_) return;
    if (reorders) {
      std::shuffle(outcomes_.begin(), outcomes_.end(), random_);
    }
    // Some stay for later.
    const std::size_t taken = reorders ? outcomes_.size() - outcomes_.size() / 3 : outcomes_.size();
    outcomes.insert(outcomes.end(), outcomes_.begin(), outcomes_.begin() + static_cast<std::ptrdiff_t>(taken));
    outcomes_.erase(outcomes_.begin(), outcomes_.begin() + static_cast<std::ptrdiff_t>(taken));
  }

  bool hasAsker() const override { return hasAskers; }
  void asked(std::vector<recorder::IdRange>& ranges) override {
    ranges.insert(ranges.end(), asked_.begin(), asked_.end());
    asked_.clear();
  }

  // Controls.
  double refuses = 0;       // the share of tries
  double loses = 0;         // never come
  double losesAnswers = 0;  // came, and the word of it is lost
  bool reorders = false;
  bool hasAskers = true;
  void setDown(bool isDown) { isDown_ = isDown; }
  // Keeps outcomes to itself.
  void setSilent(bool isSilent) { isSilent_ = isSilent; }
  void answer(std::uint64_t number, Status status) { outcomes_.push_back({number, std::move(status)}); }
  void ask(const std::vector<recorder::IdRange>& ranges) { asked_.insert(asked_.end(), ranges.begin(), ranges.end()); }
  // All that it has, though it was acknowledged.
  void loseMessages() { messages_.clear(); }
  void forgetOutcomes() { outcomes_.clear(); }

  // Observations.
  const std::map<std::string, std::string>& messages() const { return messages_; }
  const std::vector<std::uint64_t>& order() const { return order_; }
  int tries() const { return tries_; }
  int repeats() const { return repeats_; }
  int changed() const { return changed_; }  // sent again under an id with other bytes

 private:
  bool happens(double share) { return std::uniform_real_distribution<>(0, 1)(random_) < share; }

  std::mt19937_64 random_;
  bool isDown_ = false;
  bool isSilent_ = false;
  std::vector<fleet::Outcome> outcomes_;
  std::map<std::string, std::string> messages_;
  std::vector<std::uint64_t> order_;
  std::vector<recorder::IdRange> asked_;
  int tries_ = 0;
  int repeats_ = 0;
  int changed_ = 0;
};

}  // namespace tarn::testing
