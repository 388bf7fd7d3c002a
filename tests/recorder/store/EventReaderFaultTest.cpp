// SPDX-License-Identifier: Apache-2.0
// Files that hold no events of ours: what their schemas and pages say must cost no more than they are worth.
#include <array>

#include "recorder/store/reading/EventReader.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

constexpr const char* kEvents =
    "PRAGMA page_size = 512;"
    "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT, payload TEXT, detail TEXT);"
    "INSERT INTO events(backend, name) VALUES('tally', 'one'), ('tally', 'two');";

class EventReaderFaultTest : public RecorderFixture {
 protected:
  static constexpr std::size_t kPageBytes = 512;

  std::string contents() const {
    std::ifstream in(file(), std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
  }
  void write(const std::string& bytes) const { std::ofstream(file(), std::ios::binary) << bytes; }
  static std::string bigEndian(std::size_t value, std::size_t size) {
    std::string bytes(size, '\0');
    for (std::size_t at = size; at-- > 0; value >>= 8U) {
      bytes[at] = static_cast<char>(value & 0xFFU);
    }
    return bytes;
  }
  // An interior page of a table whose children are all the same page.
  static std::string pageOf(std::size_t child) {
    constexpr std::size_t kCells = 60;
    constexpr std::size_t kCellBytes = 5;
    std::string page = "\x05" + bigEndian(0, 2) + bigEndian(kCells, 2);
    page += bigEndian(kPageBytes - kCells * kCellBytes, 2) + bigEndian(0, 1) + bigEndian(child, 4);
    for (std::size_t cell = 0; cell < kCells; ++cell) {
      page += bigEndian(kPageBytes - (kCells - cell) * kCellBytes, 2);
    }
    page.resize(kPageBytes - kCells * kCellBytes);
    for (std::size_t cell = 0; cell < kCells; ++cell) {
      page += bigEndian(child, 4) + bigEndian(cell + 1, 1);
    }
    return page;
  }
  // The table of two events after `levels` levels of pages, each of which names the next one 61 times.
  void writeLeadingIntoItself(std::size_t levels) {
    change(file(), std::string(kEvents) + "CREATE TABLE room(bytes BLOB); INSERT INTO room VALUES(zeroblob(8192));");
    std::string bytes = contents();
    const std::size_t root = std::stoul(askOne(file(), "SELECT rootpage FROM sqlite_schema WHERE name = 'events'"));
    std::size_t child = bytes.size() / kPageBytes;
    bytes.replace((child - 1) * kPageBytes, kPageBytes, bytes.substr((root - 1) * kPageBytes, kPageBytes));
    for (std::size_t level = 1; level < levels; ++level, --child) {
      bytes.replace((child - 2) * kPageBytes, kPageBytes, pageOf(child));
    }
    bytes.replace((root - 1) * kPageBytes, kPageBytes, pageOf(child));
    write(bytes);
  }
};

TEST_F(EventReaderFaultTest, AViewThatNeverEndsIsNoTableOfEvents) {
  change(file(),
         "CREATE VIEW events AS WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n)"
         " SELECT i AS id, 0 AS time, 'tally' AS backend, '' AS name, '' AS payload, '' AS detail FROM n");
  const Result<EventPage> result = EventReader(file()).read({});
  EXPECT_TRUE(result.ok());
  EXPECT_TRUE(result.value.missing);
}

TEST_F(EventReaderFaultTest, ColumnsThatAreComputedSayNoMoreThanTheFileHolds) {
  change(file(),
         "CREATE TABLE events(id INTEGER PRIMARY KEY, time REAL, backend TEXT, name TEXT,"
         " payload TEXT AS (hex(zeroblob(1000000))), detail TEXT);"
         "INSERT INTO events(name) VALUES('one');");
  const Result<EventPage> result = EventReader(file()).read({});
  ASSERT_TRUE(result.failed());
  EXPECT_TRUE(result.value.rows.empty());
  EXPECT_EQ(result.error->text, file().string() + ": its rows say more than it holds");
}

TEST_F(EventReaderFaultTest, PagesThatNameOnePageOftenAreGivenUp) {
  writeLeadingIntoItself(6);  // 61^6 times two rows
  const std::string before = contents();
  EventQuery query;
  query.backend = "none";
  const Result<EventPage> result = EventReader(file()).read(query);
  ASSERT_TRUE(result.failed());
  EXPECT_EQ(result.error->text, file().string() + ": its tables lead into themselves");
  EXPECT_EQ(contents(), before);
}

TEST_F(EventReaderFaultTest, AReaderThatGaveUpReadsTheMendedFile) {
  writeLeadingIntoItself(6);
  EventReader reader(file());
  EventQuery query;
  query.backend = "none";
  ASSERT_TRUE(reader.read(query).failed());
  std::filesystem::remove(file());
  change(file(), kEvents);
  EXPECT_EQ(reader.read({}).value.rows.size(), 2U);
}

}  // namespace
}  // namespace tarn::recorder
