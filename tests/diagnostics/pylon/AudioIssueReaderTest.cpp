// SPDX-License-Identifier: Apache-2.0
// How the metric record is read: what is forgiven, what is skipped, what is refused.
#include <gtest/gtest.h>

#include <string>

#include "diagnostics/pylon/AudioIssueDetected.h"
#include "diagnostics/pylon/WireReader.h"
#include "diagnostics/pylon/WireWriter.h"

namespace pylonmetrics {
namespace {

// NOLINTBEGIN(modernize-raw-string-literal): bytes of the wire read best as bytes

using namespace std::string_literals;

struct Read {
  bool good;
  bool failed;  // the reader
  std::size_t position;
  AudioIssueDetected record;
};

Read read(const std::string& bytes) {
  WireReader reader(bytes);
  AudioIssueDetected record;
  const bool good = record.readFrom(reader);
  return {good, reader.failed(), reader.position(), record};
}

const std::string kNinePayloads(9, '\x80');  // a varint that goes on

TEST(AudioIssueReader, NothingIsAGoodRecord) {
  const Read result = read("");
  EXPECT_TRUE(result.good);
  EXPECT_TRUE(result.record == AudioIssueDetected());
}

TEST(AudioIssueReader, ReaderAtItsEndLeavesTheRecordAsItWas) {
  const std::string bytes = "\x10\x05";
  WireReader reader(bytes);
  AudioIssueDetected record;
  ASSERT_TRUE(record.readFrom(reader));
  record.setNode("kept");
  EXPECT_TRUE(record.readFrom(reader));
  EXPECT_EQ(record.duration(), 5);
  EXPECT_EQ(record.node(), "kept");
}

TEST(AudioIssueReader, FieldsMayComeInAnyOrderAndBeMissing) {
  const Read result = read("\x2a\x01r\x08\x07\x1a\x02hi"s);
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.rtaidclient(), "r");
  EXPECT_EQ(result.record.issuetype(), "hi");
  EXPECT_EQ(result.record.timestamp(), 7U);
  EXPECT_EQ(result.record.node(), "");
  EXPECT_EQ(result.record.duration(), 0);
}

TEST(AudioIssueReader, LastOfSeveralValuesCounts) {
  const Read result = read("\x10\x01\x22\x03one\x08\x01\x22\x01x\x10\x02\x08\x03\x22\x00"s);
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.duration(), 2);
  EXPECT_EQ(result.record.timestamp(), 3U);
  EXPECT_EQ(result.record.node(), "");
}

TEST(AudioIssueReader, TimestampOfZeroIsSet) {
  EXPECT_TRUE(read("\x08\x00"s).record.hasTimestamp());
}

TEST(AudioIssueReader, DurationKeepsItsLowThirtyTwoBits) {
  EXPECT_EQ(read("\x10" + std::string(9, '\xff') + "\x01").record.duration(), -1);
  EXPECT_EQ(read("\x10\xff\xff\xff\xff\x0f").record.duration(), -1);     // five bytes
  EXPECT_EQ(read("\x10\x85\x80\x80\x80\xf0\x01").record.duration(), 5);  // bits beyond the 32nd
}

TEST(AudioIssueReader, NumbersMayBeLongerThanNeeded) {
  const Read result = read("\x88\x80\x80\x00\x85\x80\x00"s);
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.timestamp(), 5U);
}

TEST(AudioIssueReader, BitsBeyondTheSixtyFourthAreDropped) {
  const Read result = read("\x08" + std::string(9, '\xff') + "\x7f");
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.timestamp(), ~std::uint64_t{0});
}

// The type in a known field's tag.

TEST(AudioIssueReader, KnownFieldIsReadAsItsTypeWhateverItsTagSays) {
  for (const unsigned type : {0U, 1U, 2U, 3U, 5U, 6U, 7U}) {
    SCOPED_TRACE(type);
    const auto tag = [type](unsigned number) { return std::string(1, static_cast<char>(number * 8 + type)); };
    const Read result =
        read(tag(1) + "\x09" + tag(2) + "\x03" + tag(3) + "\x01i" + tag(4) + "\x01n" + tag(5) + "\x01r");
    EXPECT_TRUE(result.good);
    EXPECT_EQ(result.record.timestamp(), 9U);
    EXPECT_EQ(result.record.duration(), 3);
    EXPECT_EQ(result.record.issuetype() + result.record.node() + result.record.rtaidclient(), "inr");
  }
}

// The end-group tag.

TEST(AudioIssueReader, EndGroupEndsTheRecordWhateverItsNumber) {
  for (const char tag : {'\x04', '\x0c', '\x24', '\x34'}) {
    const Read result = read("\x10\x05"s + tag + "\x10\x06");
    EXPECT_TRUE(result.good);
    EXPECT_FALSE(result.failed);
    EXPECT_EQ(result.record.duration(), 5);
    EXPECT_EQ(result.position, 3U);
  }
}

// Unknown fields.

TEST(AudioIssueReader, UnknownFieldsOfEveryTypeAreSkippedAndForgotten) {
  for (const std::string& unknown :
       {"\x30\xac\x02"s, "\x31"s + "12345678", "\x32\x03\x10\x07\x10"s, "\x33\x08\x01\x12\x01x\x34"s, "\x35"s + "1234",
        "\xf8\xff\xff\xff\x0f\x01"s, "\x32\x00"s}) {
    const Read result = read("\x10\x05" + unknown + "\x22\x01n");
    EXPECT_TRUE(result.good);
    EXPECT_EQ(result.record.duration(), 5);
    EXPECT_EQ(result.record.node(), "n");
    WireWriter writer;
    result.record.writeTo(writer);
    EXPECT_EQ(writer.bytes(), "\x10\x05\x1a\x00\x22\x01n\x2a\x00"s);
  }
}

TEST(AudioIssueReader, FieldNumberIsTheWholeTagAboveItsType) {
  // 2^32 + 2 is not field 2.
  const Read result = read("\x90\x80\x80\x80\x80\x01\x07"s);
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.duration(), 0);
}

TEST(AudioIssueReader, TypesThatMeanNothingCannotBeSkipped) {
  for (const char tag : {'\x36', '\x37'}) {
    const Read result = read("\x10\x05"s + tag + "\x00\x10\x06"s);
    EXPECT_FALSE(result.good);
    EXPECT_EQ(result.record.duration(), 5);
  }
}

TEST(AudioIssueReader, UnknownFieldThatIsCutOffFailsAtOnce) {
  for (const std::string& unknown :
       {"\x30\x80"s, "\x30"s, "\x31"s + "1234567", "\x32\x03xx"s, "\x32"s,
        "\x32\xff\xff\xff\xff\xff\xff\xff\xff\xff\x01xx"s, "\x35"s + "123", "\x33"s, "\x33\x08"s, "\x33\x08\x01"s}) {
    const Read result = read("\x22\x01n\x10\x05" + unknown);
    EXPECT_FALSE(result.good);
    EXPECT_EQ(result.record.duration(), 5);
    EXPECT_EQ(result.record.node(), "n");
  }
}

// Groups.

TEST(AudioIssueReader, GroupsAreSkippedWithAllThatIsInThem) {
  const Read result = read("\x33\x3b\x10\x07\x3c\x0a\x02\x10\x09\x34\x10\x05"s);
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.duration(), 5);
}

TEST(AudioIssueReader, GroupMustEndWithItsOwnNumber) {
  EXPECT_FALSE(read("\x33\x3c"s).good);
  EXPECT_FALSE(read("\x33\x3b\x34\x3c"s).good);
}

TEST(AudioIssueReader, GroupsAreSkippedDownToTheLimitAndNoFurther) {
  const auto nested = [](std::size_t depth) {
    return std::string(depth, '\x33') + std::string(depth, '\x34') + "\x10\x05";
  };
  EXPECT_EQ(read(nested(WireReader::kDeepestGroup)).record.duration(), 5);
  EXPECT_TRUE(read(nested(WireReader::kDeepestGroup)).good);
  EXPECT_FALSE(read(nested(WireReader::kDeepestGroup + 1)).good);
  EXPECT_FALSE(read(nested(100'000)).good);
}

// Tags and numbers without an end.

TEST(AudioIssueReader, TagThatIsCutOffFailsAndKeepsWhatWasRead) {
  for (const std::string& rest : {"\x80"s, kNinePayloads}) {
    const Read result = read("\x10\x05\x08\x06" + rest);
    EXPECT_FALSE(result.good);
    EXPECT_TRUE(result.failed);
    EXPECT_EQ(result.record.duration(), 5);
    EXPECT_EQ(result.record.timestamp(), 6U);
  }
}

TEST(AudioIssueReader, TagThatNeverEndsIsTheUnknownFieldZero) {
  // Ten bytes are taken for the tag, the next is its value, then the record goes on.
  const Read result = read(std::string(10, '\xff') + "\x01\x10\x05");
  EXPECT_TRUE(result.good);
  EXPECT_FALSE(result.failed);
  EXPECT_EQ(result.record.duration(), 5);
  EXPECT_FALSE(result.record.hasTimestamp());
}

TEST(AudioIssueReader, NumberThatNeverEndsIsZeroAndNoFailure) {
  const Read result = read("\x10\x05\x08"s + std::string(10, '\xff') + "\x10" + std::string(10, '\x81') + "\x22\x01n");
  EXPECT_TRUE(result.good);
  EXPECT_TRUE(result.record.hasTimestamp());
  EXPECT_EQ(result.record.timestamp(), 0U);
  EXPECT_EQ(result.record.duration(), 0);
  EXPECT_EQ(result.record.node(), "n");
}

TEST(AudioIssueReader, LengthThatNeverEndsIsZero) {
  const Read result = read("\x22"s + std::string(10, '\xff') + "\x10\x05");
  EXPECT_TRUE(result.good);
  EXPECT_EQ(result.record.node(), "");
  EXPECT_EQ(result.record.duration(), 5);
}

TEST(AudioIssueReader, TimestampThatIsCutOffIsSetToZero) {
  const Read result = read("\x08\x07\x08\xff"s);
  EXPECT_FALSE(result.good);
  EXPECT_TRUE(result.record.hasTimestamp());
  EXPECT_EQ(result.record.timestamp(), 0U);
}

TEST(AudioIssueReader, DurationThatIsCutOffIsZero) {
  const Read result = read("\x10\x07\x10"s);
  EXPECT_FALSE(result.good);
  EXPECT_EQ(result.record.duration(), 0);
}

TEST(AudioIssueReader, StringThatIsCutOffLeavesTheOneBefore) {
  for (const std::string& rest :
       {"\x22\x05wxyz"s, "\x22\x80"s, "\x22"s, "\x22\xff\xff\xff\xff\xff\xff\xff\xff\xff\x01wxyz"s}) {
    const Read result = read("\x22\x01n" + rest);
    EXPECT_FALSE(result.good);
    EXPECT_TRUE(result.failed);
    EXPECT_EQ(result.record.node(), "n");
  }
}

TEST(AudioIssueReader, FailedReaderStaysFailed) {
  const std::string bytes = "\x22\x05wx\x10\x05";
  WireReader reader(bytes);
  AudioIssueDetected record;
  EXPECT_FALSE(record.readFrom(reader));
  EXPECT_FALSE(record.readFrom(reader));
  EXPECT_EQ(record.duration(), 0);
}

TEST(AudioIssueReader, EveryPrefixOfARecordIsReadWithoutHarm) {
  AudioIssueDetected whole;
  whole.setTimestamp(1763632800123);
  whole.setDuration(-5);
  whole.setIssuetype("glitch");
  whole.setNode("node");
  whole.setRtaidclient("client");
  WireWriter writer;
  whole.writeTo(writer);
  std::size_t good = 0;
  for (std::size_t size = 0; size <= writer.bytes().size(); ++size) {
    good += read(writer.bytes().substr(0, size)).good ? 1U : 0U;
  }
  EXPECT_EQ(good, 6U);  // before the first field and after each of the five
}

// The reader by itself.

TEST(WireReader, AReadThatFailsDoesNotMoveOn) {
  const std::string text = "\x05wxyz";
  WireReader cutText(text);
  std::string kept = "kept";
  cutText.readString(kept);
  EXPECT_TRUE(cutText.failed());
  EXPECT_EQ(cutText.position(), 0U);
  EXPECT_EQ(kept, "kept");
  WireReader cutNumber("\x81");
  EXPECT_EQ(cutNumber.readVarint(), 0U);
  EXPECT_TRUE(cutNumber.failed());
  EXPECT_EQ(cutNumber.position(), 0U);
  const std::string group = "\x08\x01\x12\x05xy";
  WireReader cutGroup(group);
  EXPECT_FALSE(cutGroup.skip(6, 3));
  EXPECT_TRUE(cutGroup.failed());
  EXPECT_EQ(cutGroup.position(), 0U);
}

TEST(WireReader, SkipsAValueToItsLastByte) {
  const auto positionAfter = [](const std::string& bytes, unsigned type) {
    WireReader reader(bytes);
    EXPECT_TRUE(reader.skip(6, type));
    return reader.position();
  };
  EXPECT_EQ(positionAfter("\x81\x01"s, 0), 2U);
  EXPECT_EQ(positionAfter("12345678", 1), 8U);
  EXPECT_EQ(positionAfter("\x02xy"s, 2), 3U);
  EXPECT_EQ(positionAfter("\x08\x01\x34"s, 3), 3U);
  EXPECT_EQ(positionAfter("1234", 5), 4U);
}

TEST(WireReader, NoOtherTypeIsSkipped) {
  for (const unsigned type : {4U, 6U, 7U}) {
    WireReader reader("1234567890");
    EXPECT_FALSE(reader.skip(6, type)) << type;
    EXPECT_TRUE(reader.failed());
    EXPECT_EQ(reader.position(), 0U);
  }
}

TEST(WireReader, GroupThatHasNoEndOfItsOwnIsNotSkipped) {
  const std::string tooDeep = std::string(WireReader::kDeepestGroup, '\x33') + std::string(200, '\x34');
  for (const std::string& group : {""s, "\x81"s, "\x3c"s, "\x33\x3c"s, tooDeep}) {
    WireReader reader(group);
    EXPECT_FALSE(reader.skip(6, 3));
    EXPECT_TRUE(reader.failed());
    EXPECT_EQ(reader.position(), 0U);
  }
}

TEST(WireReader, GroupsAreSkippedAHundredDeep) {
  EXPECT_EQ(WireReader::kDeepestGroup, 100U);
}

TEST(AudioIssueReader, AFailedReaderAtItsEndIsNoFailureOfTheNextRecord) {
  const std::string bytes = "\x10";
  WireReader reader(bytes);
  AudioIssueDetected record;
  EXPECT_FALSE(record.readFrom(reader));
  EXPECT_TRUE(reader.atEnd());
  EXPECT_TRUE(record.readFrom(reader));
}

// NOLINTEND(modernize-raw-string-literal)

}  // namespace
}  // namespace pylonmetrics
