// SPDX-License-Identifier: Apache-2.0
// What is said of machines of several kinds, from the property dumps in testdata/: NAME.json, in the form of pw-dump,
// and NAME.expected.jsonl, each line as it is to be.
#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <string>

#include "adapters/pipewire/ActionScript.h"
#include "tests/adapters/pipewire/DumpFeeder.h"

namespace tarn::streams {

namespace {

constexpr Moment kThen = 1'500'000'000'000'000'000;

std::string read(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

std::string saidOf(const std::string& dump, Rules rules = {}) {
  StreamBook book(std::move(rules));
  feedDump(book, dump, kThen);
  std::string text;
  for (const Action& action : book.take()) {
    text += scriptOf(action);
  }
  return text;
}

}  // namespace

class PipeWireDump : public testing::TestWithParam<std::string> {
 protected:
  static std::string path(const std::string& ending) { return PIPEWIRE_TESTDATA "/" + GetParam() + ending; }
};

TEST_P(PipeWireDump, BecomesTheSessionsAndMessagesBesideIt) {
  const std::string expected = read(path(".expected.jsonl"));
  ASSERT_FALSE(expected.empty());
  EXPECT_EQ(saidOf(path(".json")), expected);
}

TEST_P(PipeWireDump, TellsNoTitleAndNoHardwareAddress) {
  const std::string said = saidOf(path(".json"));
  EXPECT_EQ(said.find("Secret"), std::string::npos);
  EXPECT_EQ(said.find("AA_BB_CC"), std::string::npos);
  EXPECT_EQ(said.find("AA:BB:CC"), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(Machines, PipeWireDump,
                         testing::Values("desktop", "hdmi", "usb", "bluetooth", "phone", "headless"),
                         [](const auto& machine) { return machine.param; });

TEST(PipeWireDumps, OfAMachineThatIsOffSayNothing) {
  Rules rules;
  rules.off = true;
  EXPECT_EQ(saidOf(PIPEWIRE_TESTDATA "/desktop.json", rules), "");
}

}  // namespace tarn::streams
