// SPDX-License-Identifier: Apache-2.0
// The metric record as a value, its bytes on the wire and its text; how it is read is in AudioIssueReaderTest.
#include "diagnostics/pylon/AudioIssueDetected.h"

#include <gtest/gtest.h>

#include <cstring>
#include <limits>
#include <string>
#include <type_traits>
#include <utility>

#include "diagnostics/pylon/CityHash64.h"
#include "diagnostics/pylon/ProtobufText.h"
#include "diagnostics/pylon/TextFields.h"
#include "diagnostics/pylon/WireWriter.h"
#include "plist/formats/Json.h"

namespace pylonmetrics {
namespace {

using namespace std::string_literals;

constexpr std::uint64_t kEmptyHash = 0x9ae16a3b2f90404f;

std::string written(const AudioIssueDetected& record) {
  WireWriter writer;
  record.writeTo(writer);
  return writer.bytes();
}

AudioIssueDetected fullRecord() {
  AudioIssueDetected record;
  record.setIssuetype("a glitch that is long enough to live on the heap");
  record.setNode("a node with a name that is long enough as well");
  record.setRtaidclient("org.example.an.application.with.a.long.name");
  record.setTimestamp(1763632800);
  record.setDuration(-7);
  return record;
}

TEST(AudioIssueDetected, DefaultRecordIsEmptyWithoutATimestamp) {
  const AudioIssueDetected record;
  EXPECT_EQ(record.issuetype(), "");
  EXPECT_EQ(record.node(), "");
  EXPECT_EQ(record.rtaidclient(), "");
  EXPECT_FALSE(record.hasTimestamp());
  EXPECT_EQ(record.timestamp(), 0U);
  EXPECT_EQ(record.duration(), 0);
}

// The wire.

TEST(AudioIssueDetected, DefaultRecordIsWrittenAsDurationAndThreeEmptyStrings) {
  EXPECT_EQ(written(AudioIssueDetected()), "\x10\x00\x1a\x00\x22\x00\x2a\x00"s);
}

TEST(AudioIssueDetected, TimestampThatWasSetToZeroIsWrittenFirst) {
  AudioIssueDetected record;
  record.setTimestamp(0);
  EXPECT_EQ(written(record), "\x08\x00\x10\x00\x1a\x00\x22\x00\x2a\x00"s);
  EXPECT_FALSE(record == AudioIssueDetected());
}

TEST(AudioIssueDetected, NegativeDurationTakesTenBytes) {
  AudioIssueDetected record;
  record.setDuration(-1);
  EXPECT_EQ(written(record), "\x10\xff\xff\xff\xff\xff\xff\xff\xff\xff\x01\x1a\x00\x22\x00\x2a\x00"s);
}

TEST(AudioIssueDetected, NumbersAtTheirLimitsAreWrittenWhole) {
  AudioIssueDetected record;
  record.setTimestamp(std::numeric_limits<std::uint64_t>::max());
  record.setDuration(std::numeric_limits<std::int32_t>::min());
  EXPECT_EQ(written(record),
            "\x08\xff\xff\xff\xff\xff\xff\xff\xff\xff\x01"
            "\x10\x80\x80\x80\x80\xf8\xff\xff\xff\xff\x01"
            "\x1a\x00\x22\x00\x2a\x00"s);
  record.setTimestamp(128);
  record.setDuration(std::numeric_limits<std::int32_t>::max());
  EXPECT_EQ(written(record), "\x08\x80\x01\x10\xff\xff\xff\xff\x07\x1a\x00\x22\x00\x2a\x00"s);
}

TEST(AudioIssueDetected, FieldsAreWrittenByNumberWithTheirBytesAsTheyAre) {
  AudioIssueDetected record;
  record.setTimestamp(300);
  record.setDuration(2);
  record.setIssuetype("gap\0\xff"s);
  record.setNode("n");
  record.setRtaidclient(std::string(200, 'c'));
  EXPECT_EQ(written(record), "\x08\xac\x02\x10\x02\x1a\x05gap\0\xff\x22\x01n\x2a\xc8\x01"s + std::string(200, 'c'));
}

// Life.

TEST(AudioIssueDetected, CopiesAreEqualAndIndependent) {
  const AudioIssueDetected source = fullRecord();
  AudioIssueDetected copy(source);
  EXPECT_TRUE(copy == source);
  EXPECT_TRUE(copy.hasTimestamp());
  copy.setNode("other");
  EXPECT_EQ(source.node(), fullRecord().node());
}

TEST(AudioIssueDetected, CopyOfARecordWithoutATimestampHasNoneEvenOverOneThatHad) {
  AudioIssueDetected source = fullRecord();
  const AudioIssueDetected taken(std::move(source));  // leaves a value after the cleared timestamp
  const AudioIssueDetected copy(source);              // NOLINT(bugprone-use-after-move): what is left is the point
  EXPECT_TRUE(taken.hasTimestamp());
  EXPECT_FALSE(copy.hasTimestamp());
  EXPECT_EQ(copy.timestamp(), 0U);
  AudioIssueDetected target = fullRecord();
  target = AudioIssueDetected();
  EXPECT_FALSE(target.hasTimestamp());
  EXPECT_EQ(target.timestamp(), 0U);
  const AudioIssueDetected empty;
  target = fullRecord();
  target = empty;
  EXPECT_TRUE(target == empty);
}

TEST(AudioIssueDetected, AssignmentToItselfChangesNothing) {
  AudioIssueDetected record = fullRecord();
  AudioIssueDetected& same = record;
  record = same;
  EXPECT_TRUE(record == fullRecord());
  record = std::move(same);
  EXPECT_TRUE(record == fullRecord());
}

TEST(AudioIssueDetected, MoveTakesEverythingAndLeavesEmptyStringsAndNoTimestamp) {
  AudioIssueDetected source = fullRecord();
  const AudioIssueDetected constructed(std::move(source));
  EXPECT_TRUE(constructed == fullRecord());
  // NOLINTBEGIN(bugprone-use-after-move): what is left is the point
  EXPECT_FALSE(source.hasTimestamp());
  EXPECT_EQ(source.issuetype() + source.node() + source.rtaidclient(), "");
  EXPECT_EQ(source.duration(), -7);
  // NOLINTEND(bugprone-use-after-move)
  source = fullRecord();
  AudioIssueDetected assigned;
  assigned.setNode("before");
  assigned = std::move(source);
  EXPECT_TRUE(assigned == fullRecord());
  // NOLINTBEGIN(bugprone-use-after-move)
  EXPECT_FALSE(source.hasTimestamp());
  EXPECT_EQ(source.issuetype() + source.node() + source.rtaidclient(), "");
  // NOLINTEND(bugprone-use-after-move)
}

TEST(AudioIssueDetected, SwapExchangesEveryField) {
  AudioIssueDetected a = fullRecord();
  AudioIssueDetected b;
  b.setDuration(3);
  b.setNode("b");
  const AudioIssueDetected small = b;
  swap(a, b);
  EXPECT_TRUE(a == small);
  EXPECT_TRUE(b == fullRecord());
  EXPECT_FALSE(a.hasTimestamp());
  EXPECT_TRUE(b.hasTimestamp());
}

// Equality and hash.

TEST(AudioIssueDetected, EveryFieldCountsForEqualityAndHash) {
  const AudioIssueDetected base = fullRecord();
  const auto differs = [&base](auto change) {
    AudioIssueDetected other = base;
    change(other);
    return !(other == base) && !(base == other) && other.hash_value() != base.hash_value();
  };
  EXPECT_TRUE(differs([](auto& record) { record.setTimestamp(1); }));
  EXPECT_TRUE(differs([](auto& record) { record.setDuration(7); }));
  EXPECT_TRUE(differs([](auto& record) { record.setIssuetype("x"); }));
  EXPECT_TRUE(differs([](auto& record) { record.setNode(record.node() + "\0"s); }));
  EXPECT_TRUE(differs([](auto& record) { record.setRtaidclient(""); }));
}

TEST(AudioIssueDetected, TimestampsThatAreNotSetAreNotCompared) {
  AudioIssueDetected left = fullRecord();
  const AudioIssueDetected taken(std::move(left));  // `left` keeps a value after its cleared timestamp
  AudioIssueDetected plain;
  plain.setDuration(-7);
  EXPECT_TRUE(left == plain);  // NOLINT(bugprone-use-after-move): what is left is the point
  EXPECT_EQ(left.hash_value(), plain.hash_value());
  EXPECT_FALSE(taken == plain);
}

TEST(AudioIssueDetected, HashJoinsItsParts) {
  AudioIssueDetected record;
  EXPECT_EQ(record.hash_value(), kEmptyHash);  // three times the same
  record.setIssuetype("glitch");
  EXPECT_EQ(record.hash_value(), cityHash64("glitch"));
  record.setTimestamp(0x123456789);
  EXPECT_EQ(record.hash_value(), cityHash64("glitch") ^ 0x123456789);
  record.setNode("n");
  record.setRtaidclient("c");
  EXPECT_EQ(record.hash_value(), cityHash64("glitch") ^ cityHash64("n") ^ cityHash64("c") ^ 0x123456789);
}

TEST(AudioIssueDetected, NegativeDurationWidensWithZerosInTheHash) {
  AudioIssueDetected record;
  record.setDuration(-1);
  EXPECT_EQ(record.hash_value(), kEmptyHash ^ 0xffffffff);
}

// The text.

TEST(AudioIssueDetected, TextIsAlphabeticalAndLeavesOutATimestampThatIsNotSet) {
  AudioIssueDetected record;
  record.setDuration(-2);
  record.setIssuetype("gl\"it\\ch\n\x01");
  record.setNode("d\xc3\xa9j\xc3\xa0");
  ProtobufText lines;
  record.formatText(lines, "issue");
  EXPECT_EQ(lines.text(),
            "issue {\n"
            "  duration: -2\n"
            "  issuetype: \"gl\\\"it\\\\ch\\n\\001\"\n"
            "  node: \"d\\303\\251j\\303\\240\"\n"
            "  rtaidclient: \"\"\n"
            "}\n");
}

TEST(AudioIssueDetected, TextEndsWithATimestampThatIsSet) {
  AudioIssueDetected record;
  record.setTimestamp(std::numeric_limits<std::uint64_t>::max());
  ProtobufText lines;
  record.formatText(lines, "issue");
  EXPECT_TRUE(lines.text().ends_with("  rtaidclient: \"\"\n  timestamp: 18446744073709551615\n}\n")) << lines.text();
}

TEST(AudioIssueDetected, FieldsOfTheTextKeepTheirNamesAndOrder) {
  AudioIssueDetected record;
  record.setIssuetype("glitch");
  record.setTimestamp(7);
  TextFields fields;
  record.formatText(fields, "issue");
  std::string json;
  tarn::plist::appendJson(json, fields.fields());
  EXPECT_EQ(json, R"({"duration":0,"issuetype":"glitch","node":"","rtaidclient":"","timestamp":7})");
}

TEST(AudioIssueDetected, CharactersThatAreNotPrintableAreEscaped) {
  ProtobufText lines;
  lines.formatString("s", "\x1f \x7e\x7f\x80\xff\r\t'");
  EXPECT_EQ(lines.text(), "s: \"\\037 ~\\177\\200\\377\\r\\t\\'\"\n");
}

TEST(AudioIssueDetected, ObjectsWithinObjectsAreIndentedByTwo) {
  ProtobufText lines;
  lines.beginObject("outer");
  lines.beginObject("inner");
  lines.formatUnsigned("n", 1);
  lines.endObject();
  lines.formatSigned("n", -1);
  lines.endObject();
  lines.formatSigned("n", 2);
  EXPECT_EQ(lines.text(), "outer {\n  inner {\n    n: 1\n  }\n  n: -1\n}\nn: 2\n");
}

TEST(WireWriter, TakingTheBytesLeavesNone) {
  WireWriter writer;
  writer.writeUnsigned(1, 127);
  EXPECT_EQ(writer.take(), "\x08\x7f");
  EXPECT_EQ(writer.bytes(), "");
  writer.writeUnsigned(31, 128);
  EXPECT_EQ(writer.take(), "\xf8\x01\x80\x01");
}

// The order of the virtual operations, as the two ABIs of this platform keep it in a pointer to a member: the offset in
// the table, with or without 1 added. Two destructors stand before the first operation.
template <class Member>
std::uintptr_t placeOf(Member member) {
  static_assert(sizeof(member) == 2 * sizeof(std::uintptr_t));
  std::uintptr_t words[2] = {};
  std::memcpy(words, &member, sizeof(member));
  return (words[0] & ~std::uintptr_t{1}) / sizeof(void*);
}

TEST(AudioIssueDetected, VirtualOperationsStandInTheirOrder) {
  static_assert(std::has_virtual_destructor_v<MetricMessage>);
  static_assert(std::is_abstract_v<MetricMessage>);
  EXPECT_EQ(placeOf(&MetricMessage::readFrom), 2U);
  EXPECT_EQ(placeOf(&MetricMessage::writeTo), 3U);
  EXPECT_EQ(placeOf(&MetricMessage::formatText), 4U);
}

}  // namespace
}  // namespace pylonmetrics
