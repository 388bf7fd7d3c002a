// SPDX-License-Identifier: Apache-2.0
// The metric record's wire format written the long way round, beside the code and without it: bytes are taken from the
// front one by one, numbers are built bit by bit. And random records and inputs for both.
#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <random>
#include <string>

#include "diagnostics/pylon/AudioIssueDetected.h"

namespace pylonmetrics::testing {

struct ModelIssue {
  std::optional<std::uint64_t> timestamp;
  std::int32_t duration = 0;
  std::string issuetype;
  std::string node;
  std::string rtaidclient;

  friend bool operator==(const ModelIssue&, const ModelIssue&) = default;
};

ModelIssue modelOf(const AudioIssueDetected& record);
AudioIssueDetected recordOf(const ModelIssue& issue);

std::string encode(const ModelIssue& issue);
// Reads into `issue`; whether the input was good.
bool decode(const std::string& bytes, ModelIssue& issue);

// A varint in its shortest form, and drawn out to so many bytes.
std::string varint(std::uint64_t value);
std::string longVarint(std::uint64_t value, std::size_t bytes);

class RandomIssues {
 public:
  explicit RandomIssues(std::uint64_t seed) : random_(seed) {}

  ModelIssue issue();
  // Fields in any order, known and unknown, right and wrong, now and then cut off or damaged.
  std::string input();

 private:
  std::uint64_t below(std::uint64_t bound) { return random_() % bound; }
  std::uint64_t number();
  std::string text();
  std::string field(int depth);

  std::mt19937_64 random_;
};

}  // namespace pylonmetrics::testing
