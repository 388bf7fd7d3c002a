// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/BinaryPropertyList.h"

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <cstdint>
#include <initializer_list>
#include <string>
#include <vector>

namespace tarn::plist {
namespace {

std::string bigEndian(std::uint64_t value, std::size_t size) {
  std::string bytes(size, '\0');
  for (std::size_t at = size; at-- > 0; value >>= 8U) {
    bytes[at] = static_cast<char>(value & 0xFFU);
  }
  return bytes;
}
std::string bytes(std::initializer_list<unsigned> values) {
  std::string made;
  for (const unsigned value : values) {
    made += static_cast<char>(value);
  }
  return made;
}

// A file around objects, its parts as it should be until a test says otherwise.
struct File {
  std::vector<std::string> objects;
  std::size_t offsetBytes = 4;
  std::size_t referenceBytes = 1;
  std::uint64_t top = 0;
  std::uint64_t objectsMore = 0;  // than there are
  std::uint64_t tableLater = 0;   // than it begins
  std::uint64_t offsetsLater = 0;

  std::string make() const {
    std::string file = "bplist00";
    std::string table;
    for (const std::string& object : objects) {
      table += bigEndian(file.size() + offsetsLater, offsetBytes);
      file += object;
    }
    const std::size_t begin = file.size();
    file += table + std::string(6, '\0') + bigEndian(offsetBytes, 1) + bigEndian(referenceBytes, 1);
    return file + bigEndian(objects.size() + objectsMore, 8) + bigEndian(top, 8) + bigEndian(begin + tableLater, 8);
  }
};

Value readFile(const File& file) {
  const PropertyListReading reading = readBinaryPropertyList(file.make());
  EXPECT_FALSE(reading.fault) << reading.fault->description();
  return reading.value;
}
Value readOne(const std::string& object) {
  return readFile({{object}});
}
std::string faultOf(const std::string& file) {
  const PropertyListReading reading = readBinaryPropertyList(file);
  EXPECT_NE(reading.fault.has_value(), reading.value.present());
  if (!reading.fault) return "none";
  EXPECT_EQ(reading.fault->place, PropertyListFault::Place::Byte);
  EXPECT_LE(reading.fault->number, file.size());
  return reading.fault->text;
}
std::string faultOf(const File& file) {
  return faultOf(file.make());
}
std::string faultOfOne(const std::string& object) {
  return faultOf(File{{object}});
}

TEST(BinaryPropertyList, IntegersOfEverySizeRead) {
  EXPECT_EQ(readOne(bytes({0x10, 0xFF})), Value(255));
  EXPECT_EQ(readOne(bytes({0x11, 0xFF, 0xFE})), Value(65534));
  EXPECT_EQ(readOne(bytes({0x12, 0xFF, 0xFF, 0xFF, 0xFF})), Value(INT64_C(4294967295)));
  EXPECT_EQ(readOne("\x13" + bigEndian(UINT64_MAX, 8)), Value(-1));
  EXPECT_EQ(readOne("\x14" + bigEndian(0, 8) + bigEndian(UINT64_MAX, 8)), Value(UINT64_MAX));
  EXPECT_EQ(readOne("\x14" + bigEndian(0, 8) + bigEndian(7, 8)), Value(7));
  EXPECT_EQ(readOne("\x14" + bigEndian(UINT64_MAX, 8) + bigEndian(UINT64_MAX, 8)), Value(-1));
  EXPECT_EQ(faultOfOne("\x14" + bigEndian(1, 8) + bigEndian(0, 8)), "an integer beyond 64 bits");
  EXPECT_EQ(faultOfOne("\x14" + bigEndian(UINT64_MAX, 8) + bigEndian(0, 8)), "an integer beyond 64 bits");
  EXPECT_EQ(faultOfOne("\x15" + std::string(32, '\0')), "an integer of a size that can't be");
}

TEST(BinaryPropertyList, RealsKeepTheirPrecision) {
  const Value narrow = readOne("\x22" + bigEndian(std::bit_cast<std::uint32_t>(0.1F), 4));
  EXPECT_EQ(narrow.kind(), Kind::Float);
  EXPECT_EQ(narrow, Value(0.1F));
  EXPECT_EQ(readOne("\x23" + bigEndian(std::bit_cast<std::uint64_t>(0.1), 8)), Value(0.1));
  EXPECT_EQ(readOne("\x23" + bigEndian(std::bit_cast<std::uint64_t>(HUGE_VAL), 8)), Value(HUGE_VAL));
  EXPECT_EQ(faultOfOne(bytes({0x21, 0, 0})), "a kind of object that has no place here");
}

TEST(BinaryPropertyList, DatesCountFrom2001) {
  EXPECT_EQ(readOne("\x33" + bigEndian(0, 8)), Value(Date{978307200}));
  EXPECT_EQ(readOne("\x33" + bigEndian(std::bit_cast<std::uint64_t>(-978307200.25), 8)), Value(Date{-0.25}));
  EXPECT_EQ(faultOfOne("\x33" + bigEndian(std::bit_cast<std::uint64_t>(HUGE_VAL), 8)), "a date that is not finite");
  EXPECT_EQ(faultOfOne("\x33" + bigEndian(std::bit_cast<std::uint64_t>(std::nan("")), 8)), "a date that is not finite");
}

TEST(BinaryPropertyList, TextsReadInBothForms) {
  EXPECT_EQ(readOne("\x52hi"), Value("hi"));
  EXPECT_EQ(readOne(bytes({0x63, 0x00, 0xE9, 0xD8, 0x3D, 0xDD, 0x0A})), Value("\u00e9\U0001F50A"));
  EXPECT_EQ(faultOfOne("\x51\xE9"), "a text that is not ASCII");
  EXPECT_EQ(faultOfOne(bytes({0x61, 0xD8, 0x3D})), "a text that is not UTF-16");
  EXPECT_EQ(faultOfOne(bytes({0x61, 0xDD, 0x0A})), "a text that is not UTF-16");
  EXPECT_EQ(faultOfOne(bytes({0x62, 0xD8, 0x3D, 0x00, 0x41})), "a text that is not UTF-16");
}

TEST(BinaryPropertyList, ACountBehindTheMarkMayHaveAnySize) {
  for (unsigned power = 0; power < 4; ++power) {
    const std::string count = bigEndian(2, std::size_t{1} << power);
    EXPECT_EQ(readOne("\x5F" + bytes({0x10 + power}) + count + "hi"), Value("hi"));
  }
  EXPECT_EQ(faultOfOne("\x5F\x14" + bigEndian(0, 8) + bigEndian(2, 8) + "hi"), "a count that is no integer");
  EXPECT_EQ(faultOfOne("\x5F\x22hi"), "a count that is no integer");
  EXPECT_EQ(faultOfOne("\x5F"), "an object that is cut off");
}

TEST(BinaryPropertyList, CountsBeyondTheFileAreFaults) {
  const std::string most = "\x13" + bigEndian(UINT64_MAX, 8);
  for (const char* mark : {"\x4F", "\x5F", "\x6F", "\xAF", "\xDF"}) {
    EXPECT_EQ(faultOfOne(mark + most), "an object that is cut off");
    EXPECT_EQ(faultOfOne(mark + ("\x13" + bigEndian(std::uint64_t{1} << 63U, 8))), "an object that is cut off");
    EXPECT_EQ(faultOfOne(mark + bytes({0x10, 3})), "an object that is cut off");
  }
  EXPECT_EQ(faultOfOne(bytes({0x12, 1})), "an object that is cut off");
}

TEST(BinaryPropertyList, ContainersReadTheirReferencesOfAnySize) {
  EXPECT_EQ(readFile({{bytes({0xD1, 1, 2}), "\x51k", bytes({0xA2, 3, 3}), "\x08"}}),
            Value(Dictionary{{"k", Array{false, false}}}));
  File wide{{"\xA1" + bigEndian(1, 8), "\x09"}};
  wide.referenceBytes = 8;
  wide.offsetBytes = 8;
  EXPECT_EQ(readFile(wide), Value(Array{true}));
  File other{{"\x08", "\x09"}};
  other.top = 1;
  EXPECT_EQ(readFile(other), Value(true));
}

TEST(BinaryPropertyList, KindsWithoutAPlaceAreFaults) {
  for (const unsigned mark : {0x00U, 0x01U, 0x0FU, 0x30U, 0x34U, 0x70U, 0x90U, 0xB0U, 0xC0U, 0xE0U, 0xF0U}) {
    EXPECT_EQ(faultOfOne(bytes({mark})), "a kind of object that has no place here") << mark;
  }
  EXPECT_EQ(faultOfOne("\x88" + std::string(9, '\0')), "a UID beyond 64 bits");
}

TEST(BinaryPropertyList, KeysAreTextsAndStandOnce) {
  EXPECT_EQ(faultOf(File{{bytes({0xD1, 1, 1}), bytes({0x10, 1})}}), "a key that is no text");
  EXPECT_EQ(faultOf(File{{bytes({0xD2, 1, 1, 1, 1}), "\x51k"}}), "a key stands twice in a dictionary");
  EXPECT_EQ(faultOf(File{{bytes({0xD2, 1, 2, 1, 1}), "\x51k", bytes({0x61, 0, 'k'})}}),
            "a key stands twice in a dictionary");
}

TEST(BinaryPropertyList, AnObjectInsideItselfIsAFault) {
  EXPECT_EQ(faultOf(File{{bytes({0xA1, 0})}}), "an object inside itself");
  EXPECT_EQ(faultOf(File{{bytes({0xA1, 1}), bytes({0xD1, 2, 0}), "\x51k"}}), "an object inside itself");
}

TEST(BinaryPropertyList, OffsetsAndReferencesThatLeadOutsideAreFaults) {
  EXPECT_EQ(faultOf(File{{bytes({0xA1, 9})}}), "a reference to an object that isn't there");
  File file{{"\x08"}};
  file.top = 1;
  EXPECT_EQ(faultOf(file), "a reference to an object that isn't there");
  file = {{"\x08"}};
  file.offsetsLater = 1;
  EXPECT_EQ(faultOf(file), "an offset that lies outside the objects");
  file.offsetsLater = std::uint64_t{0} - 8;
  EXPECT_EQ(faultOf(file), "an offset that lies outside the objects");
  EXPECT_EQ(faultOf(File{}), "a reference to an object that isn't there");
}

TEST(BinaryPropertyList, ATrailerThatCannotBeIsAFault) {
  EXPECT_EQ(faultOf("bplist01" + std::string(40, '\0')), "not of version 00");
  EXPECT_EQ(faultOf("bplist00"), "too short");
  EXPECT_EQ(faultOf("bplist00" + std::string(32, '\0')), "a trailer with sizes that can't be");
  File file{{"\x08"}};
  file.objectsMore = 1;
  EXPECT_EQ(faultOf(file), "an offset table that lies outside");
  file.objectsMore = UINT64_MAX / 4;
  EXPECT_EQ(faultOf(file), "an offset table that lies outside");
  file = {{"\x08"}};
  file.tableLater = 100;
  EXPECT_EQ(faultOf(file), "an offset table that lies outside");
  file.tableLater = UINT64_MAX - 8;
  EXPECT_EQ(faultOf(file), "an offset table that lies outside");
  file = {{"\x08"}};
  file.offsetBytes = 9;
  EXPECT_EQ(faultOf(file), "a trailer with sizes that can't be");
  file = {{"\x08"}};
  file.referenceBytes = 0;
  EXPECT_EQ(faultOf(file), "a trailer with sizes that can't be");
}

TEST(BinaryPropertyList, NestingIsBounded) {
  const auto nested = [](std::size_t levels) {
    File file;
    for (std::size_t level = 1; level < levels; ++level) {
      file.objects.push_back("\xA1" + bigEndian(level, 1));
    }
    file.objects.emplace_back("\xA0");
    return file;
  };
  EXPECT_TRUE(readFile(nested(kMaximumPropertyListNesting)).present());
  EXPECT_EQ(faultOf(nested(kMaximumPropertyListNesting + 1)), "nested too deeply");
}

TEST(BinaryPropertyList, AFewObjectsThatNameEachOtherOftenAreCutOff) {
  File file;
  for (unsigned level = 1; level <= 40; ++level) {
    file.objects.push_back(bytes({0xA4, level, level, level, level}));
  }
  file.objects.emplace_back("\xA0");
  EXPECT_EQ(faultOf(file), "too many values");
}

TEST(BinaryPropertyList, ALongTextThatIsNamedOftenIsCutOff) {
  constexpr std::size_t kLong = std::size_t{8} << 20U;
  File file;
  file.objects.push_back(bytes({0xAE, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1, 1}));
  file.objects.push_back("\x4F\x12" + bigEndian(kLong, 4) + std::string(kLong, 'x'));
  EXPECT_EQ(faultOf(file), "too large");
  file.objects[0] = bytes({0xA8, 1, 1, 1, 1, 1, 1, 1, 1});
  EXPECT_EQ(readFile(file).view().array().size(), 8U);
}

// A long UTF-16 text with its units of letters, and a root that names it as an item, or as a key of many dictionaries.
std::string longUtf16(std::uint64_t units) {
  return "\x6F\x12" + bigEndian(units, 4) + std::string(2 * units, 'a');
}
std::string arrayOfItemOne(std::uint64_t count) {
  std::string object = "\xAF\x12" + bigEndian(count, 4);
  for (std::uint64_t item = 0; item < count; ++item) {
    object += bigEndian(1, 2);
  }
  return object;
}

TEST(BinaryPropertyList, ContentIsBoundedByTheBytesOfTheFile) {
  // 100 KB, whose text a reference of two bytes names again and again: half a second of work when 64 MiB may come out.
  File file{{arrayOfItemOne(600), longUtf16(50000)}};
  file.referenceBytes = 2;
  EXPECT_EQ(faultOf(file), "too large");
  const std::uint64_t allowed = file.make().size() * kPropertyListContentPerByte / 100000;
  ASSERT_LT(allowed, kPropertyListContentOfSmallFile / 100000);
  file.objects[0] = arrayOfItemOne(kPropertyListContentOfSmallFile / 100000);
  EXPECT_EQ(readFile(file).view().array().size(), kPropertyListContentOfSmallFile / 100000);
  file.objects[0] = arrayOfItemOne(kPropertyListContentOfSmallFile / 100000 + 1);
  EXPECT_EQ(faultOf(file), "too large");
}

TEST(BinaryPropertyList, ALargerFileMayHoldMoreContent) {
  // 500 KB: 32 times as much is beyond what any small file may hold.
  File file{{arrayOfItemOne(31), longUtf16(250000)}};
  file.referenceBytes = 2;
  EXPECT_EQ(readFile(file).view().array().size(), 31U);
  file.objects[0] = arrayOfItemOne(33);
  EXPECT_EQ(faultOf(file), "too large");
}

TEST(BinaryPropertyList, ContentCountsAtEachPlaceOfASharedContainer) {
  File file{{arrayOfItemOne(40), bytes({0xD1, 0, 2, 0, 3}), longUtf16(50000), "\x09"}};
  file.referenceBytes = 2;
  EXPECT_EQ(readFile(file).view().array().size(), 40U);
  file.objects[0] = arrayOfItemOne(60);
  EXPECT_EQ(faultOf(file), "too large");
}

TEST(BinaryPropertyList, ASharedContainerStandsInEveryPlaceAndIsReadOnce) {
  File file{{bytes({0xA3, 1, 1, 3}), bytes({0xD1, 2, 3}), "\x51k", bytes({0x80, 5})}};
  const Dictionary uid{{"CF$UID", 5}};
  const Dictionary shared{{"k", uid}};
  const Value value = readFile(file);
  EXPECT_EQ(value, Value(Array{shared, shared, uid}));
  const Array items = value.view().array();
  EXPECT_TRUE(items[0].dictionary().sharesStorageWith(items[1].dictionary()));
}

TEST(BinaryPropertyList, ValuesCountAtEachPlaceOfASharedContainer) {
  // 1 + 1023 * (1 + 1024) values are within the bound, one row more is beyond it.
  File file{{arrayOfItemOne(1023), arrayOfItemOne(1024), "\x09"}};
  for (std::size_t at = 7; at < file.objects[1].size(); at += 2) {
    file.objects[1][at] = 2;
  }
  file.referenceBytes = 2;
  EXPECT_EQ(readFile(file).view().array().size(), 1023U);
  file.objects[0] = arrayOfItemOne(1024);
  EXPECT_EQ(faultOf(file), "too many values");
}

TEST(BinaryPropertyList, NestingIsBoundedWhereAContainerIsNamedAgain) {
  // Object 1 is 63 levels high, which the root's first item may be; the second item names it a level deeper.
  const std::size_t high = kMaximumPropertyListNesting - 1;
  File file{{bytes({0xA2, 1}) + bigEndian(high + 1, 1)}};
  for (std::size_t level = 1; level < high; ++level) {
    file.objects.push_back("\xA1" + bigEndian(level + 1, 1));
  }
  file.objects.emplace_back("\xA0");
  file.objects.push_back(bytes({0xA1, 1}));
  EXPECT_EQ(faultOf(file), "nested too deeply");
  file.objects.back() = bytes({0xA1, 2});
  EXPECT_EQ(readFile(file).view().array().size(), 2U);
}

TEST(BinaryPropertyList, TextsThatShareTheirUnitsAreTextsOfTheirOwn) {
  // The count of the first object's text is the mark of the second one's: 0x61 units, and 1.
  std::string file = "bplist00";
  file += bytes({0xA2, 1, 2}) + bytes({0x6F, 0x10, 0x61});
  for (unsigned unit = 0; unit < 0x61; ++unit) {
    file += bytes({0, 'x'});
  }
  const std::size_t table = file.size();
  file += bytes({8, 11, 13}) + std::string(6, '\0') + bytes({1, 1}) + bigEndian(3, 8) + bigEndian(0, 8);
  file += bigEndian(table, 8);
  const PropertyListReading reading = readBinaryPropertyList(file);
  EXPECT_EQ(reading.value, Value(Array{std::string(0x61, 'x'), "x"}));
}

TEST(BinaryPropertyList, AFileBeyondTheBoundIsNotLookedAt) {
  EXPECT_EQ(faultOf("bplist00" + std::string(kMaximumPropertyListBytes, '\0')), "too large");
}

}  // namespace
}  // namespace tarn::plist
