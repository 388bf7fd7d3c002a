// SPDX-License-Identifier: Apache-2.0
// The files with what is expected: read, refused and written.
#include "tests/scenario/Expectations.h"

#include <iterator>
#include <stdexcept>

#include "tests/scenario/ScenarioFixture.h"

namespace tarn::scenario {
namespace {

class ScenarioExpectations : public ScenarioFixture {
 protected:
  std::string written(const std::string& name) const {
    std::ifstream file(expectationFile(script(name)));
    return {std::istreambuf_iterator<char>(file), {}};
  }
};

TEST_F(ScenarioExpectations, AListOfNamesStandsForAsManyEvents) {
  const auto events = beside("a", R"({"backend":"tally","name":["x","y"],"payload":{"n":1}}
{"backend":"rtc","name":"z","detail":{"m":2}}
)");
  ASSERT_EQ(events.size(), 3U);
  EXPECT_EQ(events[1].origin, "a.expected.jsonl:1");
  EXPECT_EQ(events[1].script, "a.jsonl");
  EXPECT_EQ(events[1].name, "y");
  EXPECT_EQ(events[1].payload, (json{{"n", 1}}));
  EXPECT_EQ(events[2].backend, "rtc");
  EXPECT_EQ(events[2].detail, (json{{"m", 2}}));
}

TEST_F(ScenarioExpectations, NothingStandsBesideAScriptWithoutAFile) {
  EXPECT_TRUE(readExpectations(script("absent")).empty());
}

TEST_F(ScenarioExpectations, RefusesLinesThatItCannotRead) {
  for (const char* line :
       {"{}", "[1]", "{", "", R"({"backend":"snare"})", R"({"name":"x"})", R"({"backend":1,"name":"x"})",
        R"({"backend":"snare","name":"x","paylod":{}})", R"({"backend":"snare","name":"x","payload":{"a":"<nwo>"}})"}) {
    EXPECT_THROW(beside("a", std::string(line) + "\n"), std::runtime_error) << line;
  }
}

TEST_F(ScenarioExpectations, WritesALaneAfterTheOtherAndJoinsWhatIsAlike) {
  const std::string lines = R"({"backend":"rtc","name":"z","payload":{},"detail":{"session":"<session 1>"}}
{"backend":"tally","name":["x","y"],"payload":{"HostApplicationDisplayID":"left"}}
{"backend":"tally","name":"x","payload":{"HostApplicationDisplayID":"left","n":1}}
{"backend":"tally","name":"x","payload":{"HostApplicationDisplayID":"right"}}
)";
  auto events = beside("a", lines);
  std::rotate(events.begin(), events.begin() + 4, events.end());
  std::swap(events[1], events[2]);
  writeExpectations(script("a"), events);
  EXPECT_EQ(written("a"), lines);
}

TEST_F(ScenarioExpectations, AFileThatCannotBeWrittenIsAnError) {
  EXPECT_THROW(writeExpectations(directory_ + "/absent/a.jsonl", {}), std::runtime_error);
}

}  // namespace
}  // namespace tarn::scenario
