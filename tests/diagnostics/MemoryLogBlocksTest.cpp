// SPDX-License-Identifier: Apache-2.0
// Which lines of the memory tools are kept, and how they are cut into blocks and entries of the log.
#include <algorithm>
#include <map>

#include "tests/diagnostics/MemoryLogFixture.h"

namespace tarn {
namespace {

using namespace testing;

class MemoryLogBlocks : public MemoryLogFixture {};

TEST_F(MemoryLogBlocks, OfTheResourcesOnlyTheTellingLinesAreKept) {
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

TEST_F(MemoryLogBlocks, OfTheZonesEveryLineIsKept) {
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

TEST_F(MemoryLogBlocks, ATextOfThirteenHundredCharactersMakesThreeBlocks) {
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

TEST_F(MemoryLogBlocks, ABlockEndsBehindTheFirstNewlineThatIsFarEnough) {
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

TEST_F(MemoryLogBlocks, WithoutANewlineBlocksAreOfFiveHundredAndTwelve) {
  const Strings found = blocksOf(kZones, std::string(1300, 'x'));
  ASSERT_EQ(found.size(), 3U);
  EXPECT_EQ(found[0], "WIRED LOG BLOCK 1\nwiredlog: " + std::string(502, 'x'));
  EXPECT_EQ(found[1], "WIRED LOG BLOCK 2\n" + std::string(512, 'x'));
  EXPECT_EQ(found[2], "WIRED LOG BLOCK 3\n" + std::string(286, 'x'));
}

TEST_F(MemoryLogBlocks, ALongLineIsReadInPiecesEachWithItsTag) {
  const Strings found = blocksOf(kZones, std::string(2048, 'x') + "\n");
  ASSERT_EQ(found.size(), 1U);  // the newline after the second piece ends the first block
  EXPECT_EQ(found[0], "WIRED LOG BLOCK 1\nwiredlog: " + std::string(2047, 'x') + "wiredlog: x\n");
}

TEST_F(MemoryLogBlocks, MegabytesAreCutWithALine) {
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

TEST_F(MemoryLogBlocks, AsMuchAsIsKeptIsTheEndToTheByte) {
  const std::size_t lineCount = Worker::kMostBytesKept / 128;
  std::size_t bytes = 0;
  for (const std::string& block : blocksOf(kZones, taggedLines(lineCount + 1, 128))) {
    bytes += block.size() - block.find('\n') - 1;
  }
  EXPECT_EQ(bytes, Worker::kMostBytesKept);
}

TEST_F(MemoryLogBlocks, AByteLessThanIsReadIsNotTheEnd) {
  std::string noise = std::string(1022, 'x') + "\n";
  while (noise.size() + 1 < Worker::kMostBytesRead) {
    noise.append(1023, 'x').append(1, '\n');
  }
  EXPECT_EQ(noise.size() + 1, Worker::kMostBytesRead);
  EXPECT_EQ(blocksOf(kResources, noise + "RESOURCE\n"), (Strings{"WIRED LOG BLOCK 1\nwiredlog: RESOURCE\n"}));
}

TEST_F(MemoryLogBlocks, MegabytesThatNobodyKeepsAreReadWithinABoundToo) {
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

TEST_F(MemoryLogBlocks, OddBytesAreLoggedAsTheyCome) {
  EXPECT_EQ(blocksOf(kZones, "%s %@ %d\n\xff\xfe\x01\x1b[0m\n"),
            (Strings{"WIRED LOG BLOCK 1\nwiredlog: %s %@ %d\nwiredlog: \xff\xfe\x01\x1b[0m\n"}));
}

// The blocks after their heads, by number.
std::map<std::string, std::string> joined(const std::vector<std::string>& entries) {
  std::map<std::string, std::string> texts;
  for (const std::string& entry : entries) {
    const std::size_t head = std::min(entry.find('\n'), entry.size());
    texts[entry.substr(0, head)] += entry.substr(std::min(head + 1, entry.size()));
  }
  return texts;
}

TEST_F(MemoryLogBlocks, ABlockThatALogEntryCannotHoldIsSeveralEntriesOfItsNumber) {
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

TEST_F(MemoryLogBlocks, ABlockOfAsMuchAsAnEntryHoldsIsOneEntry) {
  // 65,536 bytes, but for 64 that are the head's.
  const std::size_t tags = 32 * 10;  // 31 whole pieces and the rest
  const auto entriesOf = [&](std::size_t blockBytes) {
    return blocksOf(kZones, std::string(blockBytes - tags - 1, 'x') + "\n").size();
  };
  EXPECT_EQ(entriesOf(65472), 1U);
  EXPECT_EQ(entriesOf(65473), 2U);
}

TEST_F(MemoryLogBlocks, AnEntryOfABlockDoesNotEndInsideACharacter) {
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

}  // namespace
}  // namespace tarn
