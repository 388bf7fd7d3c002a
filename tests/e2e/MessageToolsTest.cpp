// SPDX-License-Identifier: Apache-2.0
// tarnreportingctl lint and explain: what is wrong in a script, and what a name or a key means.
#include <filesystem>

#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::e2e {
namespace {

class MessageTools : public ServiceFixture {
 protected:
  static std::size_t countOf(const std::string& text, const std::string& part) {
    std::size_t count = 0;
    for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + 1)) {
      ++count;
    }
    return count;
  }
};

TEST_F(MessageTools, LintIsSilentAboutACleanScript) {
  const Finished finished = ctl({"lint"}, R"({"op": "createReportingSession", "reporterID": 1}

{"op": "sendMessage", "category": "Playback", "type": "Start", "message": {"session_output_running": true}}
)");
  EXPECT_EQ(finished.status, 0);
  EXPECT_EQ(finished.output, "");
  EXPECT_EQ(finished.complaints, "");
}

TEST_F(MessageTools, LintTellsEveryFindingWithItsLineAndEndsWith65) {
  const std::string path = directory_ / "player.jsonl";
  writeFile(path, R"({"op": "sendMessage", "category": "Playbak", "type": "Start", "message": {}}

{"op": "sendMessage", "category": 4, "type": "MemoryLog", "message": {}}
{"op": "sendMessage", "category": 4, "type": 1, "message": {"KvSessionVolume": 55, "volume_source": "knob"}}
no JSON
{"op": "getAllReporters"})");
  const Finished finished = ctl({"lint", path});
  EXPECT_EQ(finished.status, 65);
  EXPECT_EQ(finished.complaints, "");
  EXPECT_TRUE(finished.output.starts_with(path + ":1: member \"category\" is \"Playbak\", expected "))
      << finished.output;
  EXPECT_NE(finished.output.find("; MemoryLog has to be given by its number, 19\n" + path +
                                 ":4: key \"KvSessionVolume\" is 55: wrong unit or out of range, expected number, "
                                 "scalar, 0 to 1; is it per cent? that would be 0.55\n" +
                                 path + ":4: no part reads the key \"volume_source\"\n" + path + ":5: column "),
            std::string::npos)
      << finished.output;
  EXPECT_EQ(countOf(finished.output, path + ":"), 5U);
}

TEST_F(MessageTools, LintWithOwnKeysPassesKeysThatNobodyReads) {
  const std::string line = R"({"op": "sendMessage", "category": 4, "type": 1, "message": {"volume_source": "knob"}})";
  EXPECT_EQ(ctl({"lint"}, line).status, 65);
  EXPECT_EQ(ctl({"lint"}, line).output, "stdin:1: no part reads the key \"volume_source\"\n");
  EXPECT_EQ(ctl({"lint", "--own-keys"}, line).status, 0);
  EXPECT_EQ(ctl({"lint", "--own-keys", "-"}, line).output, "");
}

TEST_F(MessageTools, LintOfAScriptThatIsNotThereIs65) {
  const Finished finished = ctl({"lint", directory_ / "none.jsonl"});
  EXPECT_EQ(finished.status, 65);
  EXPECT_NE(finished.complaints.find("none.jsonl"), std::string::npos);
}

TEST_F(MessageTools, ExplainTellsEverythingOfTheName) {
  const Finished finished = ctl({"explain", "Generic"});
  EXPECT_EQ(finished.status, 0);
  EXPECT_TRUE(finished.output.starts_with("Generic: category 1\n  meaning     ")) << finished.output;
  EXPECT_NE(finished.output.find("\n\nGeneric: type 0\n"), std::string::npos) << finished.output;
  EXPECT_NE(ctl({"explain", "14"}).output.find("Volume: category 14\n"), std::string::npos);
  EXPECT_NE(ctl({"explain", "0x10000000"}).output.find("DSP: domain of categories 268435456\n"), std::string::npos);
  EXPECT_NE(ctl({"explain", "SessionPylonWorker"}).output.find("\n  reads       issue_type, node, rtaid_client, any_"),
            std::string::npos);
}

TEST_F(MessageTools, ExplainTellsWhatAKeyIs) {
  EXPECT_EQ(ctl({"explain", "any_channel_silence_seconds"}).output,
            "any_channel_silence_seconds: a key of messages\n"
            "  meaning     How long a channel was silent.\n"
            "  kind        number\n"
            "  unit        s\n"
            "  range       0 to 2147483647\n"
            "  only in     *.IssueDetector\n"
            "  read by     TarnReportingSessionPylonWorker\n"
            "  written by  clients\n"
            "  derives     The duration of the metric record, in whole seconds.\n");
}

TEST_F(MessageTools, ExplainOfNothingIs1AndTellsWhatIsMeant) {
  const Finished finished = ctl({"explain", "session_durations"});
  EXPECT_EQ(finished.status, 1);
  EXPECT_EQ(finished.output, "");
  EXPECT_EQ(finished.complaints,
            "tarnreportingctl: nothing is called session_durations; did you mean session_duration?\n");
  EXPECT_NE(ctl({"explain", "frobnication"}).complaints.find("docs/messages.md"), std::string::npos);
  EXPECT_EQ(ctl({"explain", "--script", "frobnication"}).status, 1);
  EXPECT_EQ(ctl({"explain"}).status, 64);
}

TEST_F(MessageTools, TheScriptOfAnExampleCanBePlayed) {
  const Finished script = ctl({"explain", "--script", "Volume Summary"});
  ASSERT_EQ(script.status, 0);
  ASSERT_TRUE(script.output.starts_with("{\"op\": \"createReportingSession\"")) << script.output;
  EXPECT_EQ(ctl({"lint"}, script.output).output, "");
  ASSERT_TRUE(startService());
  EXPECT_EQ(ctl({"run"}, script.output).status, 0);
  ledgerAtRest();
  EXPECT_EQ(events("sys.oxbow.tarnkit.Volume.Summary").size(), 2U);
}

TEST_F(MessageTools, TheExampleScriptsUseNoKeyThatLooksLikeAMistake) {
  std::size_t scripts = 0;
  for (const auto& entry : std::filesystem::recursive_directory_iterator(TARN_EXAMPLES)) {
    const std::string path = entry.path();
    if (!path.ends_with(".jsonl") || path.ends_with(".expected.jsonl")) continue;
    ++scripts;
    EXPECT_EQ(ctl({"lint", "--own-keys", path}).output, "");
  }
  EXPECT_GT(scripts, 15U);
}

}  // namespace
}  // namespace tarn::e2e
