// SPDX-License-Identifier: Apache-2.0
// Summary files and replies as events.
#include "tests/scenario/Recorded.h"

#include "tests/scenario/ScenarioFixture.h"

namespace tarn::scenario {
namespace {

class ScenarioRecorded : public ScenarioFixture {
 protected:
  ScenarioRecorded() { std::filesystem::create_directories(folder()); }
  std::string folder() const { return directory_ + "/DiagnosticLogs/Audio/Reporting/"; }
  void write(const std::string& name, const std::string& content) const { std::ofstream(folder() + name) << content; }
};

TEST_F(ScenarioRecorded, ASummaryFileIsNamedWithoutTimeAndNumberInTheOrderOfTheStops) {
  write("20240131-142501+0100-7-org_app-test-2.json", "[\n{\n  \"a\": 2\n}\n]\n");
  write("20240131-142501+0100-7-org_app-test.json", "[\n{\n  \"a\": 1\n}\n]\n");
  const auto files = summaryFiles(directory_);
  ASSERT_EQ(files.size(), 2U);
  EXPECT_EQ(files[0].name, "7-org_app-test");
  EXPECT_EQ(files[1].name, "7-org_app-test");
  EXPECT_EQ(files[0].payload, (json{{"lines", 5}, {"content", {{{"a", 1}}}}}));
  EXPECT_EQ(files[1].payload, (json{{"lines", 5}, {"content", {{{"a", 2}}}}}));
}

TEST_F(ScenarioRecorded, AFileThatIsNotNamedAsItMustBeKeepsItsName) {
  write("2024-01-31-7-org_app-test.json", "[]\n");
  write("20240131-142501+0100-7-org_app-test.txt", "[]\n");
  const auto files = summaryFiles(directory_);
  ASSERT_EQ(files.size(), 2U);
  EXPECT_EQ(files[0].name, "2024-01-31-7-org_app-test.json");
  EXPECT_EQ(files[1].name, "20240131-142501+0100-7-org_app-test.txt");
}

TEST_F(ScenarioRecorded, AFileThatIsNoJsonIsItsText) {
  write("20240131-142501+0100-7-org_app-test.json", "[\n{");
  EXPECT_EQ(summaryFiles(directory_).at(0).payload, (json{{"lines", 1}, {"content", "[\n{"}}));
}

TEST_F(ScenarioRecorded, WithoutTheFolderThereAreNoFiles) {
  std::filesystem::remove_all(directory_ + "/DiagnosticLogs");
  EXPECT_TRUE(summaryFiles(directory_).empty());
}

TEST_F(ScenarioRecorded, RepliesComeInTheOrderOfTheirLines) {
  const std::string path = directory_ + "/replies";
  std::ofstream(path) << R"({"client":"main","line":10,"op":"stop","error":null,"result":true}
{"client":"main","line":2,"op":"start","error":null,"result":true}
{"client":"main","line":2,"op":"start","error":"refused","result":null}
)";
  const auto replies = repliesTo("a.jsonl", path);
  ASSERT_EQ(replies.size(), 3U);
  EXPECT_EQ(replies[0].name, "2 start");
  EXPECT_EQ(replies[0].script, "a.jsonl");
  EXPECT_EQ(replies[0].payload, (json{{"result", true}}));
  EXPECT_EQ(replies[1].payload, (json{{"error", "refused"}}));
  EXPECT_EQ(replies[2].name, "10 stop");
}

}  // namespace
}  // namespace tarn::scenario
