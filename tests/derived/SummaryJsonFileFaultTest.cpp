// SPDX-License-Identifier: Apache-2.0
// The summary file on a disk that refuses: each fault is logged once, what was written stays, the session ends as
// usual.
#include "tests/derived/SummaryJsonFileFixture.h"

namespace tarn {
namespace {

using namespace testing;
using Operation = FakeFileSystem::Operation;
using Strings = std::vector<std::string>;

class SummaryJsonFileFault : public SummaryJsonFileFixture {
 protected:
  static constexpr const char* kName = "20240131-142501+0100-4711-Unknown-test.json";

  static std::string numbered(std::size_t number) {
    return pathOf("20240131-142501+0100-4711-Unknown-test-" + std::to_string(number) + ".json");
  }
  // The period of golden/without_the_misfit.json.
  static void play(TarnReportingSession& session) {
    session.start();
    session.sendMessage(message({{"n", 1}}));
    session.sendMessage(message({{"n", 2}, {"bad", plist::Date{1}}}));
    session.sendMessage(message({{"n", 3}}));
    session.stop();
  }
  // Whether the session stopped its workers and is ready for the next start.
  static void expectEnded(const TarnReportingSession& session) {
    EXPECT_FALSE(session.started());
    EXPECT_TRUE(session.messages().empty());
    EXPECT_FALSE(session.workers().messageWorkers().front().worker->started());
  }
  Strings errors() const {
    Strings lines = ownLines(platform::LogLevel::Error);
    std::erase_if(lines, [](const std::string& line) { return line.starts_with("dataWithJSONObject: "); });
    return lines;
  }
};

TEST_F(SummaryJsonFileFault, DirectoryThatCannotBeMadeIsLoggedAndTheOpenTriedAllTheSame) {
  platform_.fileSystem.failNext(Operation::CreateDirectories, {30, "Read-only file system"});
  const auto session = makeTestSession();
  play(*session);
  EXPECT_EQ(errors(),
            (Strings{"can't create logging directory at /device/DiagnosticLogs/Audio/Reporting: Read-only file system",
                     "SummaryJsonFileWorker failed to open file. action=open file=" + pathOf(kName) +
                         " error=\"No such file or directory\""}));
  expectEnded(*session);
}

TEST_F(SummaryJsonFileFault, DirectoryThatIsThereAllTheSameGetsItsFile) {
  platform_.fileSystem.putFile(pathOf("other"), "");
  platform_.fileSystem.failNext(Operation::CreateDirectories, {13, "Permission denied"});
  play(*makeTestSession());
  EXPECT_EQ(errors().size(), 1U);
  EXPECT_EQ(contentOf(pathOf(kName)), golden("without_the_misfit.json"));
}

TEST_F(SummaryJsonFileFault, FileInTheDirectorysPlaceIsLogged) {
  platform_.fileSystem.putFile("/device/DiagnosticLogs/Audio", "");
  const auto session = makeTestSession();
  play(*session);
  EXPECT_EQ(errors().size(), 2U);
  expectEnded(*session);
}

TEST_F(SummaryJsonFileFault, FileThatCannotBeMadeIsLoggedOnceHoweverManyMessagesThereAre) {
  platform_.fileSystem.failNext(Operation::CreateFile, {28, "No space left on device"});
  const auto session = makeTestSession();
  play(*session);
  EXPECT_EQ(errors(), (Strings{"SummaryJsonFileWorker failed to open file. action=open file=" + pathOf(kName) +
                               " error=\"No space left on device\""}));
  EXPECT_TRUE(platform_.fileSystem.files().empty());
  expectEnded(*session);
}

TEST_F(SummaryJsonFileFault, FileThatCannotBeOpenedIsLoggedOnce) {
  platform_.fileSystem.failNext(Operation::OpenForWriting, {24, "Too many open files"});
  const auto session = makeTestSession();
  play(*session);
  EXPECT_EQ(errors(), (Strings{"SummaryJsonFileWorker failed to open file. action=open file=" + pathOf(kName) +
                               " error=\"Too many open files\""}));
  EXPECT_FALSE(platform_.log.contains("SummaryJsonFileWorker closed"));
  expectEnded(*session);
}

TEST_F(SummaryJsonFileFault, WorkerIsNotStartedWhenItsFileCannotBeOpened) {
  platform_.fileSystem.failNext(Operation::OpenForWriting, {24, "Too many open files"});
  const auto session = makeTestSession();
  session->sendMessage(message({{"n", 1}}));
  const auto worker = TarnReportingSessionSummaryJsonFileWorker::initWithSession(session);
  worker->stop();
  EXPECT_FALSE(worker->started());
}

TEST_F(SummaryJsonFileFault, NextPeriodWritesItsFileAgain) {
  platform_.fileSystem.failNext(Operation::CreateFile, {28, "No space left on device"});
  const auto session = makeTestSession();
  play(*session);
  play(*session);
  EXPECT_EQ(memberNames(onlyFile()),
            (Strings{"Setup_Start_1", "Playback_Start_1", "Playback_Start_2", "Setup_Stop_1"}));
}

TEST_F(SummaryJsonFileFault, WriteThatFailsAtAnyPointIsLoggedOnceAndWhatWasWrittenStays) {
  const std::string whole = golden("without_the_misfit.json");
  constexpr std::size_t kWrites = 6;  // "[", four objects, "]": a message's lines are one write
  std::size_t longest = 0;
  for (std::size_t skip = 0; skip < kWrites; ++skip) {
    SCOPED_TRACE(skip);
    platform_.log.clear();
    platform_.fileSystem.failNext(Operation::Write, {5, "Input/output error"}, skip);
    const auto session = makeTestSession();
    play(*session);
    const std::string path = skip == 0 ? pathOf(kName) : numbered(skip + 1);
    EXPECT_EQ(errors(), (Strings{"SummaryJsonFileWorker failed to write line. action=writeline file=" + path +
                                 " error=\"Input/output error\""}));
    const std::string content = contentOf(path);
    EXPECT_EQ(content, whole.substr(0, content.size()));
    EXPECT_TRUE(skip == 0 || content == "[\n" || content.ends_with("\n}\n")) << content;
    EXPECT_LT(content.size(), whole.size());
    EXPECT_TRUE(skip == 0 || content.size() > longest);
    longest = content.size();
    expectEnded(*session);
    EXPECT_EQ(platform_.fileSystem.openFiles(), 0U);
  }
}

TEST_F(SummaryJsonFileFault, MessagesAfterAFailedWriteAreNotLookedAt) {
  platform_.fileSystem.failNext(Operation::Write, {5, "Input/output error"}, 1);
  play(*makeTestSession());
  EXPECT_EQ(ownLines(platform::LogLevel::Error).size(), 1U);  // nothing about the misfit
}

TEST_F(SummaryJsonFileFault, NextPeriodAfterAFailedWriteHasAWholeFile) {
  platform_.fileSystem.failNext(Operation::Write, {5, "Input/output error"}, 2);
  const auto session = makeTestSession();
  play(*session);
  platform_.clock.advance(std::chrono::seconds(1));
  play(*session);
  EXPECT_EQ(errors().size(), 1U);
  const Strings names = memberNames(contentOf(pathOf("20240131-142502+0100-4711-Unknown-test.json")));
  EXPECT_EQ(names, (Strings{"Setup_Start_1", "Playback_Start_1", "Playback_Start_2", "Setup_Stop_1"}));
}

TEST_F(SummaryJsonFileFault, WorkerIsStartedAgainWhenALaterFileOpens) {
  platform_.fileSystem.failNext(Operation::OpenForWriting, {24, "Too many open files"});
  const auto session = makeTestSession();
  session->sendMessage(message({{"n", 1}}));
  const auto worker = TarnReportingSessionSummaryJsonFileWorker::initWithSession(session);
  worker->stop();
  worker->stop();
  EXPECT_TRUE(worker->started());
}

TEST_F(SummaryJsonFileFault, LastOfTheNumberedNamesIsUsedAndOneMoreIsAnError) {
  platform_.fileSystem.putFile(pathOf(kName), "");
  for (std::size_t number = 2; number < 10000; ++number) {
    platform_.fileSystem.putFile(numbered(number), "");
  }
  play(*makeTestSession());
  EXPECT_EQ(contentOf(numbered(10000)), golden("without_the_misfit.json"));
  EXPECT_TRUE(errors().empty());
  play(*makeTestSession());
  EXPECT_EQ(errors(), (Strings{"SummaryJsonFileWorker failed to open file. action=open file=" + numbered(10000) +
                               " error=\"File exists\""}));
}

TEST_F(SummaryJsonFileFault, FullDiskKeepsWhatFits) {
  const std::string whole = golden("without_the_misfit.json");
  for (const std::size_t room : {std::size_t{0}, std::size_t{1}, std::size_t{2}, whole.size() / 2, whole.size() - 1}) {
    SCOPED_TRACE(room);
    platform_.log.clear();
    platform_.clock.advance(std::chrono::seconds(1));
    platform_.fileSystem.setFreeBytes(room);
    const auto session = makeTestSession();
    play(*session);
    ASSERT_EQ(errors().size(), 1U);
    EXPECT_TRUE(errors().front().ends_with("error=\"No space left on device\""));
    EXPECT_EQ(contentOf(platform_.fileSystem.files().back()).size(), room);
    expectEnded(*session);
  }
}

TEST_F(SummaryJsonFileFault, DiskWithJustEnoughRoomTakesTheWholeFile) {
  const std::string whole = golden("without_the_misfit.json");
  platform_.fileSystem.setFreeBytes(whole.size());
  play(*makeTestSession());
  EXPECT_TRUE(errors().empty());
  EXPECT_EQ(onlyFile(), whole);
}

TEST_F(SummaryJsonFileFault, CloseThatFailsIsLoggedOnce) {
  platform_.fileSystem.failNext(Operation::Close, {122, "Disk quota exceeded"});
  const auto session = makeTestSession();
  play(*session);
  EXPECT_EQ(errors(), (Strings{"SummaryJsonFileWorker failed to closed file. action=close file=" + pathOf(kName) +
                               " error=\"Disk quota exceeded\""}));
  EXPECT_FALSE(platform_.log.contains("SummaryJsonFileWorker closed"));
  EXPECT_EQ(onlyFile(), golden("without_the_misfit.json"));
  expectEnded(*session);
}

TEST_F(SummaryJsonFileFault, SessionThatIsGoneLeavesNothingToWrite) {
  auto session = makeTestSession();
  session->sendMessage(message({{"n", 1}}));
  const auto worker = TarnReportingSessionSummaryJsonFileWorker::initWithSession(session);
  session.reset();
  worker->stop();
  EXPECT_TRUE(platform_.fileSystem.files().empty());
}

}  // namespace
}  // namespace tarn
