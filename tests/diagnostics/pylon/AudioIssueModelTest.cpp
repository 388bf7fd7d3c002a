// SPDX-License-Identifier: Apache-2.0
// Random records and random inputs beside the slow and obvious model of the wire format.
#include <gtest/gtest.h>

#include <cstdio>
#include <random>

#include "diagnostics/pylon/AudioIssueDetected.h"
#include "diagnostics/pylon/WireReader.h"
#include "diagnostics/pylon/WireWriter.h"
#include "tests/diagnostics/pylon/AudioIssueModels.h"
#include "tests/support/Seeds.h"

namespace pylonmetrics::testing {
namespace {

std::string written(const AudioIssueDetected& record) {
  WireWriter writer;
  record.writeTo(writer);
  return writer.bytes();
}

TEST(AudioIssueModel, RandomRecordsAreWrittenAsTheModelWritesThemAndReadBack) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    RandomIssues random(seed);
    for (int round = 0; round < 5000; ++round) {
      const ModelIssue issue = random.issue();
      const AudioIssueDetected record = recordOf(issue);
      const std::string bytes = written(record);
      ASSERT_EQ(bytes, encode(issue));
      AudioIssueDetected again;
      WireReader reader(bytes);
      ASSERT_TRUE(again.readFrom(reader));
      ASSERT_TRUE(reader.atEnd());
      ASSERT_TRUE(again == record);
      ASSERT_EQ(again.hash_value(), record.hash_value());
      ModelIssue modelled;
      ASSERT_TRUE(decode(bytes, modelled));
      ASSERT_EQ(modelled, issue);
    }
  }
}

TEST(AudioIssueModel, RandomInputsAreReadAsTheModelReadsThem) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(2)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    RandomIssues random(seed);
    int good = 0;
    int bad = 0;
    for (int round = 0; round < 50000; ++round) {
      const std::string bytes = random.input();
      ModelIssue expected;
      const bool isGood = decode(bytes, expected);
      AudioIssueDetected record;
      WireReader reader(bytes);
      ASSERT_EQ(record.readFrom(reader), isGood) << "round " << round;
      ASSERT_EQ(modelOf(record), expected) << "round " << round;
      ++(isGood ? good : bad);
    }
    // Both kinds must have been seen in numbers, or this says little.
    EXPECT_GT(good, 5000);
    EXPECT_GT(bad, 5000);
  }
}

}  // namespace
}  // namespace pylonmetrics::testing
