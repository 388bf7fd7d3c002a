// SPDX-License-Identifier: Apache-2.0
#include "fleet/cursor/CursorFile.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "tests/recorder/RecorderFixture.h"

namespace tarn::fleet {
namespace {

class FleetCursor : public ::testing::Test {
 protected:
  std::string path() const { return (directory_.path() / "cursor").string(); }
  std::string content() const {
    std::ifstream file(path(), std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }
  void setContent(const std::string& text) const { std::ofstream(path(), std::ios::binary) << text; }
  ReadCursor read() const {
    CursorFile file(path());
    Result<ReadCursor> read = file.read();
    EXPECT_TRUE(read.ok()) << read.error.text();
    return read.value;
  }
  static Cursor someCursor(std::int64_t event) {
    return {event, 1'750'000'000'000'000 + event, {3, "a boot\n", 1750000000.25}, {5, 7, event}};
  }
  void write(std::initializer_list<std::int64_t> events) const {
    CursorFile file(path());
    for (const std::int64_t event : events) {
      EXPECT_TRUE(file.write(someCursor(event)).ok());
    }
  }

  recorder::TemporaryDirectory directory_;
};

TEST_F(FleetCursor, WithoutAFileItIsTheBeginning) {
  EXPECT_EQ(read().cursor, Cursor());
  EXPECT_EQ(read().remark, "");
}

TEST_F(FleetCursor, WhatIsWrittenIsReadAgain) {
  write({11});
  EXPECT_EQ(read().cursor, someCursor(11));
  write({12, 13});
  EXPECT_EQ(read().cursor, someCursor(13));
  EXPECT_EQ(read().remark, "");
  CursorFile file(path());
  EXPECT_TRUE(file.write(Cursor()).ok());
  EXPECT_EQ(read().cursor, Cursor());
}

TEST_F(FleetCursor, AStateThatIsDamagedGivesWayToTheOneBefore) {
  write({11, 12});
  std::string text = content();
  text[30] = static_cast<char>(text[30] ^ 1);
  setContent(text);
  EXPECT_EQ(read().cursor, someCursor(11));
  EXPECT_EQ(read().remark, path() + ": damaged; going on from the state before");
}

TEST_F(FleetCursor, WithoutAnyWholeStateItIsTheBeginningAndNoGuess) {
  write({11, 12});
  const std::string whole = content();
  for (const std::string& text : {std::string(), std::string("x"), std::string(100, '\0'), whole.substr(0, 40),
                                  whole.substr(1, whole.find('\n')), std::string("\n\n")}) {
    setContent(text);
    EXPECT_EQ(read().cursor, Cursor()) << text;
    EXPECT_EQ(read().remark, path() + ": damaged; going on from the beginning of the store");
  }
}

TEST_F(FleetCursor, NoFlippedBitMakesAnotherState) {
  write({11, 12});
  const std::string whole = content();
  for (std::size_t bit = 0; bit < whole.size() * 8; ++bit) {
    std::string text = whole;
    text[bit / 8] = static_cast<char>(text[bit / 8] ^ (1 << (bit % 8)));
    setContent(text);
    const Cursor cursor = read().cursor;
    // Where the lines run together neither is whole, and it is the beginning.
    EXPECT_TRUE(cursor == someCursor(11) || cursor == someCursor(12) || cursor == Cursor()) << bit;
    EXPECT_TRUE(bit / 8 == whole.find('\n') || cursor != Cursor()) << bit;
  }
}

TEST_F(FleetCursor, AFileThatGrewIsPassedOverWhereItIsNotWhole) {
  write({11});
  setContent("something\n" + content());
  EXPECT_EQ(read().cursor, someCursor(11));
}

TEST_F(FleetCursor, AFolderThatIsNotThereIsAnError) {
  CursorFile file((directory_.path() / "missing" / "cursor").string());
  EXPECT_TRUE(file.read().ok());
  EXPECT_EQ(file.write(Cursor()).code(), ENOENT);
}

}  // namespace
}  // namespace tarn::fleet
