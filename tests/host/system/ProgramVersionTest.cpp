// SPDX-License-Identifier: Apache-2.0
#include "host/system/ProgramVersion.h"

#include <gtest/gtest.h>

#include <regex>

namespace tarn::linux_host {
namespace {

TEST(ProgramVersion, TellsVersionCommitAndBuild) {
  EXPECT_EQ(programVersion("tarnreportingd", "0123456789ab", "feed"),
            "tarnreportingd " TARN_VERSION " (commit 0123456789ab, build feed)");
}

TEST(ProgramVersion, LeavesOutWhatIsNotKnown) {
  EXPECT_EQ(programVersion("p", "", "feed"), "p " TARN_VERSION " (build feed)");
  EXPECT_EQ(programVersion("p", "0123456789ab", ""), "p " TARN_VERSION " (commit 0123456789ab)");
  EXPECT_EQ(programVersion("p", "", ""), "p " TARN_VERSION);
}

TEST(ProgramVersion, BuildIdentifierIsThatOfTheProgramItself) {
  const std::string identifier = buildIdentifier();
  EXPECT_TRUE(std::regex_match(identifier, std::regex("[0-9a-f]{40}"))) << identifier;
}

}  // namespace
}  // namespace tarn::linux_host
