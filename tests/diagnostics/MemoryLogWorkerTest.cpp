// The worker that writes the output of two memory tools to the log: who may ask, how often, what is kept and how it is
// cut into entries.
#include "diagnostics/TarnReportingSessionMemoryLogWorker.h"

#include <algorithm>
#include <map>

#include "diagnostics/TarnReportingMemoryLogLimiter.h"
#include "tests/diagnostics/OddValues.h"
#include "tests/session/SessionFixture.h"

namespace tarn {
namespace {

using namespace testing;
using namespace std::chrono_literals;
using platform::CommandEnd;
using Strings = std::vector<std::string>;
using Worker = TarnReportingSessionMemoryLogWorker;

constexpr const char* kResources = "/usr/local/bin/restop";
constexpr const char* kZones = "/usr/bin/zonetally -l";

class MemoryLogWorker : public SessionFixture {
 protected:
  MemoryLogWorker() {
    useWorkers<Worker, ConsumerWorker>();
    runToolsDuringWaits();
  }

  void runToolsDuringWaits() {
    platform_.conditions.onWait([this](auto) {
      platform_.runUntilIdle();
      return WaitEnd::TimesOut;
    });
  }
  static std::shared_ptr<TarnReportingSession> startedSession(AudioServiceType type = AudioServiceType::Test,
                                                              std::int64_t reporterID = 7) {
    auto session = makeSession(reporterID);
    session->setServiceType(type);
    session->start();
    return session;
  }
  static void request(TarnReportingSession& session, plist::Dictionary payload = {}) {
    session.sendMessage(message(std::move(payload), AudioEventCategory::Generic, AudioEventType::MemoryLog));
  }
  void describe(const char* command, std::string output, CommandEnd end = {}) {
    platform_.commandRunner.describe(command, {std::move(output), end, {}});
  }
  std::size_t runs() const { return platform_.commandRunner.runs().size(); }
  // The lines of the worker, which are those without a module.
  Strings lines() const {
    Strings found;
    for (const auto& entry : platform_.log.entries()) {
      if (entry.module.empty()) {
        EXPECT_EQ(entry.subsystem, "sys.oxbow.tarnkit");
        EXPECT_EQ(entry.category, "tarnrr");
        EXPECT_EQ(entry.level, LogLevel::Error);
        found.push_back(entry.text);
      }
    }
    return found;
  }
  // The blocks, and the lines that are none.
  Strings blocks() const {
    Strings found = lines();
    std::erase_if(found, [](const std::string& line) { return !line.starts_with("WIRED LOG BLOCK "); });
    return found;
  }
  Strings notes() const {
    Strings found = lines();
    std::erase_if(found, [](const std::string& line) { return line.starts_with("WIRED LOG BLOCK "); });
    return found;
  }
  // The blocks of a request when the tool prints this and the other one nothing.
  Strings blocksOf(const char* command, const std::string& output) {
    describe(kResources, "");
    describe(kZones, "");
    describe(command, output);
    platform_.log.clear();
    platform_.clock.advance(6s);
    request(*startedSession());
    return blocks();
  }
};

TEST_F(MemoryLogWorker, IsMadeForTestSessionsAndOnInternalBuildsForAll) {
  EXPECT_EQ(startedSession(AudioServiceType::Test)->workerInstanceCount(), 2U);
  EXPECT_EQ(startedSession(AudioServiceType::Haptics)->workerInstanceCount(), 1U);
}

TEST_F(MemoryLogWorker, OnAnInternalBuildItRunsFromTheSessionsCreationOn) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = makeSession();
  request(*session);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, DoesNotRunInSingleMessageSessions) {
  platform_.deviceProperties.set("InternalBuild", true);
  const auto session = makeSession(1, TarnReportingSession::Mode::SingleMessage);
  session->start();
  request(*session);
  EXPECT_EQ(runs(), 0U);
}

TEST_F(MemoryLogWorker, OtherMessagesDoNothing) {
  const auto session = startedSession();
  for (std::uint16_t type = 0; type < 30; ++type) {
    if (type != 19) {
      session->sendMessage(message({}, AudioEventCategory::Generic, static_cast<AudioEventType>(type)));
    }
  }
  EXPECT_EQ(runs(), 0U);
  EXPECT_TRUE(lines().empty());
  request(*session);
  EXPECT_EQ(runs(), 2U);  // nor did they count for the limiter
}

TEST_F(MemoryLogWorker, RunsBothToolsForAMinuteAtMostAndClosesThem) {
  request(*startedSession());
  const auto found = platform_.commandRunner.runs();
  ASSERT_EQ(found.size(), 2U);
  EXPECT_EQ(found[0].commandText, kZones);
  EXPECT_EQ(found[1].commandText, kResources);
  for (const auto& run : found) {
    EXPECT_EQ(run.timeLimit, 60s);
    EXPECT_TRUE(run.closed);
  }
}

TEST_F(MemoryLogWorker, TheToolsRunOnQueuesOfTheirOwnAndBothBeforeTheWaitEnds) {
  std::size_t waiting = 0;
  platform_.conditions.onWait([&](auto) {
    waiting = platform_.workQueues.waiting();
    platform_.runUntilIdle();
    return WaitEnd::TimesOut;
  });
  request(*startedSession());
  EXPECT_EQ(waiting, 2U);
  EXPECT_EQ(platform_.workQueues.names(),
            (Strings{"sys.oxbow.tarnkit.reporting.server", "sys.oxbow.tarnkit.reporting.memorylog.zones",
                     "sys.oxbow.tarnkit.reporting.memorylog.resources"}));
}

TEST_F(MemoryLogWorker, LogsTheZonesFirstEachToolsBlocksCountedFromOne) {
  describe(kZones, "zone a\n");
  describe(kResources, "1 phys_mem 5\n");
  request(*startedSession());
  EXPECT_EQ(lines(),
            (Strings{"wiredlog: requesting '/usr/bin/zonetally -l'", "wiredlog: request /usr/bin/zonetally -l captured",
                     "wiredlog: requesting '/usr/local/bin/restop'", "wiredlog: request /usr/local/bin/restop captured",
                     "WIRED LOG BLOCK 1\nwiredlog: zone a\n", "WIRED LOG BLOCK 1\nwiredlog: 1 phys_mem 5\n"}));
}

TEST_F(MemoryLogWorker, ToolsThatDoNotExistAreToldAndLeaveNoBlock) {
  request(*startedSession());
  EXPECT_EQ(
      lines(),
      (Strings{"wiredlog: requesting '/usr/bin/zonetally -l'", "wiredlog: unable to execute '/usr/bin/zonetally -l'",
               "wiredlog: requesting '/usr/local/bin/restop'", "wiredlog: unable to execute '/usr/local/bin/restop'"}));
}

TEST_F(MemoryLogWorker, AFileThatIsNoProgramIsNotExecutableEither) {
  describe(kZones, "", {CommandEnd::Kind::Exited, 126});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: unable to execute '/usr/bin/zonetally -l'");
}

TEST_F(MemoryLogWorker, AToolThatPrintedWasExecutedWhateverItsStatus) {
  describe(kZones, "zone\n", {CommandEnd::Kind::Exited, 127});
  describe(kResources, "dropped\n", {CommandEnd::Kind::Exited, 126});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: request /usr/bin/zonetally -l captured");
  EXPECT_EQ(notes()[3], "wiredlog: request /usr/local/bin/restop captured");
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: zone\n"}));
}

TEST_F(MemoryLogWorker, AToolThatFailsSilentlyIsCapturedAndLeavesNoBlock) {
  describe(kZones, "", {CommandEnd::Kind::Exited, 1});
  describe(kResources, "", {CommandEnd::Kind::Signalled, 127});
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: request /usr/bin/zonetally -l captured");
  EXPECT_EQ(notes()[3], "wiredlog: request /usr/local/bin/restop captured");
  EXPECT_TRUE(blocks().empty());
}

TEST_F(MemoryLogWorker, AToolThatCannotBeStartedIsTold) {
  platform_.commandRunner.describe(kZones, {"never read", {}, Error{11, "no more processes"}});
  describe(kResources, "RESOURCE\n");
  request(*startedSession());
  EXPECT_EQ(notes()[1], "wiredlog: unable to execute '/usr/bin/zonetally -l'");
  EXPECT_EQ(notes().size(), 4U);
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: RESOURCE\n"}));
}

TEST_F(MemoryLogWorker, AToolThatDiesOrHangsCountsForWhatItPrinted) {
  describe(kZones, "half a li", {CommandEnd::Kind::Signalled, 9});
  platform_.commandRunner.describeHanging(kResources, "RESOURCE\nanother RESOURCE");
  request(*startedSession());
  EXPECT_EQ(blocks(), (Strings{"WIRED LOG BLOCK 1\nwiredlog: half a li",
                               "WIRED LOG BLOCK 1\nwiredlog: RESOURCE\nwiredlog: another RESOURCE"}));
}

TEST_F(MemoryLogWorker, OfTheResourcesOnlyTheTellingLinesAreKept) {
  const std::string output =
      "NAME RESOURCE VALUE\n"
      "a cpu_time 1\n"
      "a phys_mem 2\n"
      "a wired_mem 3\n"
      "a phys_footprint 4\n"
      "a other 5\n"
      "cpu_time at the start\n"
      "\n"
      "resource\n"
      "b wired_mem          0           0           0        none\n"
      "b wired_mem          0           0           1        none\n"
      "b cpu_time wired_mem          0           0           0        none\n"
      "b wired_mem cpu_time xwired_mem          0           0           0        none\n"
      "c phys_mem xwired_mem          0           0           0        none";
  EXPECT_EQ(blocksOf(kResources, output),
            (Strings{"WIRED LOG BLOCK 1\n"
                     "wiredlog: NAME RESOURCE VALUE\n"
                     "wiredlog: a cpu_time 1\n"
                     "wiredlog: a phys_mem 2\n"
                     "wiredlog: a wired_mem 3\n"
                     "wiredlog: a phys_footprint 4\n"
                     "wiredlog: b wired_mem          0           0           1        none\n"
                     "wiredlog: c phys_mem xwired_mem          0           0           0        none"}));
}

TEST_F(MemoryLogWorker, OfTheZonesEveryLineIsKept) {
  EXPECT_EQ(blocksOf(kZones, "x\n\n a wired_mem          0           0           0        none\ny"),
            (Strings{"WIRED LOG BLOCK 1\nwiredlog: x\nwiredlog: \n"
                     "wiredlog:  a wired_mem          0           0           0        none\nwiredlog: y"}));
}

// Output whose lines are as long as told once the tag stands before them.
std::string taggedLines(std::size_t count, std::size_t length) {
  std::string output;
  for (std::size_t i = 0; i < count; ++i) {
    output += std::string(length - 11, static_cast<char>('a' + i % 26)) + "\n";
  }
  return output;
}

TEST_F(MemoryLogWorker, ATextOfThirteenHundredCharactersMakesThreeBlocks) {
  const Strings found = blocksOf(kZones, taggedLines(13, 100));
  ASSERT_EQ(found.size(), 3U);
  const std::string head = "WIRED LOG BLOCK 1\n";
  EXPECT_EQ(found[0].size(), head.size() + 600);
  EXPECT_EQ(found[1].size(), head.size() + 600);
  EXPECT_EQ(found[2].size(), head.size() + 100);
  for (std::size_t i = 0; i < found.size(); ++i) {
    EXPECT_TRUE(found[i].starts_with("WIRED LOG BLOCK " + std::to_string(i + 1) + "\nwiredlog: "));
    EXPECT_EQ(found[i].back(), '\n');
  }
  EXPECT_EQ(found[2], "WIRED LOG BLOCK 3\nwiredlog: " + std::string(89, 'm') + "\n");
}

TEST_F(MemoryLogWorker, ABlockEndsBehindTheFirstNewlineThatIsFarEnough) {
  struct Case {
    std::size_t firstLine;            // with its tag and newline
    std::vector<std::size_t> blocks;  // their sizes, when a line of 100 follows
  };
  // A newline as the 512th character is not far enough, one as the 513th is.
  for (const Case& row : {Case{511, {611}}, Case{512, {612}}, Case{513, {513, 100}}, Case{514, {514, 100}},
                          Case{411, {511}}, Case{412, {512}}, Case{413, {513}}}) {
    std::vector<std::size_t> sizes;
    for (const std::string& block : blocksOf(kZones, taggedLines(1, row.firstLine) + taggedLines(1, 100))) {
      sizes.push_back(block.size() - block.find('\n') - 1);
    }
    EXPECT_EQ(sizes, row.blocks) << row.firstLine;
  }
}

TEST_F(MemoryLogWorker, WithoutANewlineBlocksAreOfFiveHundredAndTwelve) {
  const Strings found = blocksOf(kZones, std::string(1300, 'x'));
  ASSERT_EQ(found.size(), 3U);
  EXPECT_EQ(found[0], "WIRED LOG BLOCK 1\nwiredlog: " + std::string(502, 'x'));
  EXPECT_EQ(found[1], "WIRED LOG BLOCK 2\n" + std::string(512, 'x'));
  EXPECT_EQ(found[2], "WIRED LOG BLOCK 3\n" + std::string(286, 'x'));
}

TEST_F(MemoryLogWorker, ALongLineIsReadInPiecesEachWithItsTag) {
  const Strings found = blocksOf(kZones, std::string(2048, 'x') + "\n");
  ASSERT_EQ(found.size(), 1U);  // the newline after the second piece ends the first block
  EXPECT_EQ(found[0], "WIRED LOG BLOCK 1\nwiredlog: " + std::string(2047, 'x') + "wiredlog: x\n");
}

TEST_F(MemoryLogWorker, MegabytesAreCutWithALine) {
  const std::size_t lineCount = Worker::kMostBytesKept / 100 + 500;
  const Strings found = blocksOf(kZones, taggedLines(lineCount, 100));
  std::size_t bytes = 0;
  for (const std::string& block : found) {
    bytes += block.size() - block.find('\n') - 1;
  }
  EXPECT_GE(bytes, Worker::kMostBytesKept);
  EXPECT_LT(bytes, Worker::kMostBytesKept + 100);
  EXPECT_EQ(notes()[1], "wiredlog: output of '/usr/bin/zonetally -l' cut");
  EXPECT_EQ(notes()[2], "wiredlog: request /usr/bin/zonetally -l captured");
}

TEST_F(MemoryLogWorker, AsMuchAsIsKeptIsTheEndToTheByte) {
  const std::size_t lineCount = Worker::kMostBytesKept / 128;
  std::size_t bytes = 0;
  for (const std::string& block : blocksOf(kZones, taggedLines(lineCount + 1, 128))) {
    bytes += block.size() - block.find('\n') - 1;
  }
  EXPECT_EQ(bytes, Worker::kMostBytesKept);
}

TEST_F(MemoryLogWorker, AByteLessThanIsReadIsNotTheEnd) {
  std::string noise = std::string(1022, 'x') + "\n";
  while (noise.size() + 1 < Worker::kMostBytesRead) {
    noise.append(1023, 'x').append(1, '\n');
  }
  EXPECT_EQ(noise.size() + 1, Worker::kMostBytesRead);
  EXPECT_EQ(blocksOf(kResources, noise + "RESOURCE\n"), (Strings{"WIRED LOG BLOCK 1\nwiredlog: RESOURCE\n"}));
}

TEST_F(MemoryLogWorker, MegabytesThatNobodyKeepsAreReadWithinABoundToo) {
  constexpr std::size_t kLine = 1024;
  std::string noise;
  while (noise.size() < Worker::kMostBytesRead) {
    noise.append(kLine - 1, 'x').append(1, '\n');
  }
  EXPECT_TRUE(blocksOf(kResources, noise).empty());
  EXPECT_EQ(notes().size(), 4U);  // as much as is read, and nothing was cut
  EXPECT_TRUE(blocksOf(kResources, noise + "RESOURCE\n").empty());
  EXPECT_EQ(notes()[3], "wiredlog: output of '/usr/local/bin/restop' cut");
}

TEST_F(MemoryLogWorker, OddBytesAreLoggedAsTheyCome) {
  EXPECT_EQ(blocksOf(kZones, "%s %@ %d\n\xff\xfe\x01\x1b[0m\n"),
            (Strings{"WIRED LOG BLOCK 1\nwiredlog: %s %@ %d\nwiredlog: \xff\xfe\x01\x1b[0m\n"}));
}

TEST_F(MemoryLogWorker, TwoRequestsThreeSecondsApartRunTheToolsOnce) {
  const auto one = startedSession(AudioServiceType::Test, 1);
  const auto other = startedSession(AudioServiceType::Test, 2);
  request(*one);
  platform_.clock.advance(3s);
  request(*other);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, FiveSecondsAreNotEnoughAndANanosecondMoreIs) {
  const auto session = startedSession();
  request(*session);
  platform_.clock.advance(5s);
  request(*session);
  EXPECT_EQ(runs(), 2U);
  platform_.clock.advance(1ns);
  request(*session);
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, ARequestThatIsRefusedDoesNotPutTheNextOneOff) {
  const auto session = startedSession();
  for (int i = 0; i < 4; ++i) {  // at 0, 3, 6 and 9 seconds
    request(*session);
    platform_.clock.advance(3s);
  }
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, ARequestThatRepeatsTheOneBeforeIsARequest) {
  const auto session = startedSession();
  request(*session, {{"a", 1}});
  platform_.clock.advance(6s);
  request(*session, {{"a", 1}});
  EXPECT_EQ(script().received.size(), 1U);  // to others it is a repetition
  EXPECT_EQ(runs(), 4U);
}

TEST_F(MemoryLogWorker, AWallClockThatIsSetChangesNothing) {
  const auto session = startedSession();
  request(*session);
  platform_.clock.setEpochSeconds(now() + 100);
  request(*session);
  EXPECT_EQ(runs(), 2U);
}

TEST_F(MemoryLogWorker, AnyPayloadIsARequest) {
  for (const auto& [value, number] : oddValues()) {
    platform_.clock.advance(6s);
    const std::size_t before = runs();
    request(*startedSession(), {{"anything", value}});
    EXPECT_EQ(runs() - before, 2U);
  }
}

TEST_F(MemoryLogWorker, ToolsThatGetNoThreadAreGivenUpAndTheSessionStops) {
  platform_.conditions.onWait([this](std::chrono::duration<double> timeout) {
    EXPECT_LE(timeout, Worker::kPatience);
    platform_.clock.advance(80s);
    return WaitEnd::TimesOut;
  });
  describe(kZones, "zone\n");
  auto session = startedSession();
  request(*session);
  EXPECT_EQ(platform_.conditions.timeouts().size(), 1U);  // one deadline for both
  EXPECT_EQ(lines(), (Strings{"wiredlog: gave up waiting for '/usr/bin/zonetally -l'",
                              "wiredlog: gave up waiting for '/usr/local/bin/restop'"}));
  session->stop();
  EXPECT_FALSE(session->started());
  session.reset();
  platform_.runUntilIdle();  // the tools find nobody who waits
  EXPECT_EQ(runs(), 2U);
  EXPECT_TRUE(blocks().empty());
}

TEST_F(MemoryLogWorker, AWakeWithoutAResultWaitsOn) {
  int waits = 0;
  platform_.conditions.onWait([&](auto) {
    if (++waits == 3) {
      platform_.runUntilIdle();
    }
    return WaitEnd::Wakes;
  });
  describe(kZones, "zone\n");
  request(*startedSession());
  EXPECT_EQ(blocks().size(), 1U);
  EXPECT_EQ(waits, 3);
}

// The blocks after their heads, by number.
std::map<std::string, std::string> joined(const Strings& entries) {
  std::map<std::string, std::string> texts;
  for (const std::string& entry : entries) {
    const std::size_t head = std::min(entry.find('\n'), entry.size());
    texts[entry.substr(0, head)] += entry.substr(std::min(head + 1, entry.size()));
  }
  return texts;
}

TEST_F(MemoryLogWorker, ABlockThatALogEntryCannotHoldIsSeveralEntriesOfItsNumber) {
  const std::string line(2047 * 70, 'x');
  std::string block;
  for (int piece = 0; piece < 70; ++piece) {
    block += "wiredlog: " + std::string(2047, 'x');
  }
  block += "wiredlog: \n";
  const Strings found = blocksOf(kZones, line + "\nshort\n");
  EXPECT_EQ(found.size(), 4U);
  for (const std::string& entry : found) {
    EXPECT_EQ(entry.find(" more bytes)"), std::string::npos);
  }
  EXPECT_EQ(joined(found), (std::map<std::string, std::string>{{"WIRED LOG BLOCK 1", block},
                                                               {"WIRED LOG BLOCK 2", "wiredlog: short\n"}}));
}

TEST_F(MemoryLogWorker, ABlockOfAsMuchAsAnEntryHoldsIsOneEntry) {
  // 65,536 bytes, but for 64 that are the head's.
  const std::size_t tags = 32 * 10;  // 31 whole pieces and the rest
  const auto entriesOf = [&](std::size_t blockBytes) {
    return blocksOf(kZones, std::string(blockBytes - tags - 1, 'x') + "\n").size();
  };
  EXPECT_EQ(entriesOf(65472), 1U);
  EXPECT_EQ(entriesOf(65473), 2U);
}

TEST_F(MemoryLogWorker, AnEntryOfABlockDoesNotEndInsideACharacter) {
  for (const char* character : {"\xE2\x82\xAC", "\xE2\x81\xBF"}) {
    std::string line;
    while (line.size() < 100'000) {
      line += character;
    }
    for (const char* lead : {"", "a", "ab"}) {
      for (const std::string& entry : blocksOf(kZones, lead + line + "\n")) {
        EXPECT_NE(static_cast<unsigned char>(entry[entry.find('\n') + 1]) & 0xC0U, 0x80U);
        EXPECT_FALSE(entry.empty());
      }
    }
  }
  // Bytes that are no characters are cut all the same, at the most as much earlier as a character is long.
  const Strings cut = blocksOf(kZones, std::string(100'000, '\x80') + "\n");
  ASSERT_EQ(cut.size(), 2U);
  EXPECT_EQ(cut[0].size() - cut[0].find('\n') - 1, 65468U);
}

TEST_F(MemoryLogWorker, BoundsAreAsDocumented) {
  EXPECT_EQ(Worker::kToolTimeLimit, 60s);
  EXPECT_EQ(Worker::kPatience, 75s);
  EXPECT_EQ(Worker::kMostBytesRead, 16'777'216U);
  EXPECT_EQ(Worker::kMostBytesKept, 1'048'576U);
}

TEST_F(MemoryLogWorker, EachToolSignalsOnceThatItIsDone) {
  request(*startedSession());
  ASSERT_EQ(platform_.conditions.made().size(), 2U);
  EXPECT_EQ(platform_.conditions.made()[0]->signals(), 1U);
  EXPECT_EQ(platform_.conditions.made()[1]->signals(), 1U);
  EXPECT_EQ(platform_.conditions.timeouts(), (std::vector<std::chrono::duration<double>>{75s}));
}

TEST_F(MemoryLogWorker, AWaitThatTimesOutIsNotRepeated) {
  std::size_t waits = 0;
  platform_.conditions.onWait([&](auto) {
    if (++waits > 2) {
      platform_.clock.advance(80s);  // or it would wait for ever
    }
    return WaitEnd::TimesOut;
  });
  request(*startedSession());
  EXPECT_EQ(waits, 2U);  // one for each tool
  EXPECT_EQ(platform_.log.count("gave up waiting for"), 2U);
}

TEST_F(MemoryLogWorker, WhenThePatienceIsOverToTheNanosecondNothingIsWaitedFor) {
  platform_.conditions.onWait([this](auto) {
    platform_.clock.advance(75s);
    return WaitEnd::Wakes;
  });
  request(*startedSession());
  EXPECT_EQ(platform_.conditions.timeouts().size(), 1U);
}

TEST_F(MemoryLogWorker, AToolIsToldThenRunThenClosedThenToldAndTheBlocksComeLast) {
  describe(kZones, "zone\n");
  const auto session = startedSession();
  platform_.order.start();
  Worker(session).handleMessage(message({}, AudioEventCategory::Generic, AudioEventType::MemoryLog));
  EXPECT_EQ(platform_.order.entries(),
            (Strings{"wait", "log wiredlog: requesting '/usr/bin/zonetally -l'", "run /usr/bin/zonetally -l",
                     "close /usr/bin/zonetally -l", "log wiredlog: request /usr/bin/zonetally -l captured",
                     "log wiredlog: requesting '/usr/local/bin/restop'", "run /usr/local/bin/restop",
                     "close /usr/local/bin/restop", "log wiredlog: unable to execute '/usr/local/bin/restop'",
                     "log WIRED LOG BLOCK 1\nwiredlog: zone\n"}));
}

TEST(MemoryLogLimiter, TheFirstIsAlwaysLetThrough) {
  for (const auto now : {-1h, 0h, 1h}) {
    EXPECT_TRUE(TarnReportingMemoryLogLimiter().claim(now));
  }
}

TEST(MemoryLogLimiter, LetsOneThroughInMoreThanFiveSeconds) {
  TarnReportingMemoryLogLimiter limiter;
  EXPECT_TRUE(limiter.claim(0s));
  EXPECT_FALSE(limiter.claim(0s));
  EXPECT_FALSE(limiter.claim(5s - 1ns));
  EXPECT_FALSE(limiter.claim(5s));
  EXPECT_TRUE(limiter.claim(5s + 1ns));
  EXPECT_FALSE(limiter.claim(10s + 1ns));
  EXPECT_TRUE(limiter.claim(10s + 2ns));
}

}  // namespace
}  // namespace tarn
