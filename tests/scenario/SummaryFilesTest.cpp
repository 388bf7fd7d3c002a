// The check of summary files: it has to find one that is missing, extra or says something else than the recorder.
#include "tests/scenario/SummaryFiles.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>

namespace tarn::scenario {
namespace {

constexpr const char* kName = "20240131-142501+0100-7-org_app-test.json";

// A session of two messages, the later one sent first, and its summary.
class SummaryFilesCheck : public ::testing::Test {
 public:
  ~SummaryFilesCheck() override {
    std::error_code ignored;
    std::filesystem::remove_all(directory_, ignored);
  }

 protected:
  SummaryFilesCheck() {
    std::string name = (std::filesystem::temp_directory_path() / "tarnscenario.XXXXXX").string();
    if (::mkdtemp(name.data()) != nullptr) {
      directory_ = name;
    }
    std::filesystem::create_directories(folder());
    expectation_.script = "script.jsonl";
    expectation_.files = {{7, "org/app", "test", 2, 1, 1}};
    arrives("Playback.Start", 20);
    arrives("Playback.Start", 10);
    arrives("Session_Generic.Summary", 5);
    elements_ = {
        element("Setup_Start_1", {{"method", "start"}}, "NO"), element("Setup_Stop_1", {{"method", "stop"}}, "YES"),
        element("Playback_Start_1", events_[2].payload, "NO"), element("Playback_Start_2", events_[0].payload, "YES"),
        element("Session_Generic_Summary_1", events_[4].payload, "YES")};
  }

  std::string folder() const { return directory_ + "/DiagnosticLogs/Audio/Reporting/"; }
  void arrives(const std::string& kind, double stamp) {
    const json payload = {{"tarnreporting_timestamp", stamp}, {"HostApplicationDisplayID", "org/app"}};
    for (const char* prefix : {"sys.oxbow.tarnkit.", "sys.oxbow.test."}) {
      events_.push_back(
          {static_cast<std::int64_t>(events_.size()) + 1, 0, "tally", prefix + kind, payload, json::object()});
    }
  }
  static json element(const std::string& name, json payload, const char* isStarted) {
    payload["isSessionStarted"] = isStarted;
    return {{name, payload}};
  }
  // Writes the elements as the service does.
  void write(const std::string& name) const {
    std::ofstream file(folder() + name);
    file << "[\n";
    for (std::size_t index = 0; index < elements_.size(); ++index) {
      file << (index == 0 ? "" : ",\n") << elements_[index].dump(2) << '\n';
    }
    file << "]\n";
  }
  std::vector<std::string> differences() const {
    SummaryFiles files(directory_);
    files.compare({expectation_}, events_);
    return files.differences();
  }
  void expectDifference(const std::string& part) const {
    const auto found = differences();
    EXPECT_TRUE(std::any_of(found.begin(), found.end(), [&](const std::string& text) {
      return text.find(part) != std::string::npos;
    })) << json(found).dump(1);
  }

  std::string directory_;
  Expectation expectation_;
  std::vector<RecordedEvent> events_;
  std::vector<json> elements_;
};

TEST_F(SummaryFilesCheck, FindsNothingWhereAllIsAsItMustBe) {
  write(kName);
  EXPECT_EQ(differences(), std::vector<std::string>{});
}

TEST_F(SummaryFilesCheck, FindsAMissingFile) {
  expectDifference("script.jsonl: no summary file of reporter 7, test");
  std::filesystem::remove_all(directory_ + "/DiagnosticLogs");
  expectDifference("script.jsonl: no summary file of reporter 7, test");
}

TEST_F(SummaryFilesCheck, FindsAFileThatNoStopLeft) {
  write(kName);
  write("20240131-142501+0100-7-org_app-test-2.json");
  EXPECT_EQ(differences(),
            (std::vector<std::string>{"extra: the summary file 20240131-142501+0100-7-org_app-test-2.json"}));
}

TEST_F(SummaryFilesCheck, FindsAFileOfAnotherName) {
  for (const char* name : {"20240131-142501+0100-8-org_app-test.json", "20240131-142501+0100-7-org_app-wisp.json",
                           "2024-01-31-7-org_app-test.json"}) {
    write(name);
    expectDifference("no summary file");
    std::filesystem::remove(folder() + name);
  }
}

TEST_F(SummaryFilesCheck, FindsAValueThatTheRecorderDoesNotHave) {
  elements_[3].begin().value()["tarnreporting_timestamp"] = 21;
  write(kName);
  expectDifference("Playback_Start_2 is ");
}

TEST_F(SummaryFilesCheck, FindsMessagesInTheOrderOfTheirArrival) {
  std::swap(elements_[2].begin().value(), elements_[3].begin().value());
  write(kName);
  expectDifference("Playback_Start_1 is ");
}

TEST_F(SummaryFilesCheck, FindsAWrongNumber) {
  elements_[3] = {{"Playback_Start_3", elements_[3].begin().value()}};
  write(kName);
  expectDifference("Playback_Start_3 is where Playback_Start_2 must be");
}

TEST_F(SummaryFilesCheck, FindsAMessageThatIsNotThere) {
  elements_.pop_back();
  write(kName);
  expectDifference("2 messages and 2 markers, 1 before the start; expected 3, 2 and 1");
}

TEST_F(SummaryFilesCheck, FindsAMessageTooMuch) {
  elements_.push_back(elements_.back());
  write(kName);
  expectDifference("Session_Generic_Summary_1 is in no event");
}

TEST_F(SummaryFilesCheck, FindsAMissingMarker) {
  elements_.erase(elements_.begin());
  write(kName);
  expectDifference("3 messages and 1 markers");
}

TEST_F(SummaryFilesCheck, FindsAWrongOrMissingStateOfTheSession) {
  elements_[2].begin().value()["isSessionStarted"] = "YES";
  write(kName);
  expectDifference("0 before the start; expected 3, 2 and 1");
  elements_[2].begin().value().erase("isSessionStarted");
  write(kName);
  expectDifference("Playback_Start_1 is ");
}

TEST_F(SummaryFilesCheck, FindsAFileThatIsNoPrettyPrintedArray) {
  for (const char* content : {"", "[", "[]\n", "[{\"a\":1}]\n", "{}\n", "[\n{\n  \"a\": }\n]\n"}) {
    std::ofstream(folder() + kName) << content;
    expectDifference("not the lines of a pretty-printed array");
  }
}

}  // namespace
}  // namespace tarn::scenario
