// SPDX-License-Identifier: Apache-2.0
#include "wire/CborReader.h"

#include <gtest/gtest.h>

#include "plist/PackedBuilder.h"
#include "tests/wire/Bytes.h"
#include "wire/BuilderSink.h"
#include "wire/PropertyListReader.h"

namespace tarn::wire {
namespace {

using testing::asBytes;
using testing::fromHex;

TEST(CborReader, AHeadThatIsReadAnewKeepsNothingOfTheOneBefore) {
  const std::string bytes = fromHex("1bffffffffffffffff 1807 190102 1a01020304 9f 05");
  CborReader in(asBytes(bytes));
  CborHead head;
  for (const std::uint64_t argument : {0xFFFFFFFFFFFFFFFFULL, 7ULL, 0x0102ULL, 0x01020304ULL, 0ULL, 5ULL}) {
    ASSERT_TRUE(in.readHead(head));
    EXPECT_EQ(head.argument, argument);
  }
  EXPECT_TRUE(in.atEnd());
}

TEST(CborReader, BytesAreTakenAsFarAsTheyGo) {
  const std::string bytes = fromHex("010203");
  CborReader in(asBytes(bytes));
  std::string_view taken;
  EXPECT_FALSE(in.readBytes(4, taken));
  ASSERT_TRUE(in.readBytes(3, taken));
  EXPECT_EQ(taken, bytes);
  EXPECT_TRUE(in.readBytes(0, taken));
}

TEST(PropertyListReader, AContainerIsNoScalar) {
  for (const char* hex : {"80", "a0"}) {
    const std::string bytes = fromHex(hex);
    CborReader in(asBytes(bytes));
    plist::PackedBuilder builder;
    plist::KeyListCache keyLists;
    BuilderSink sink(builder, keyLists);
    PropertyListReader<BuilderSink> reader(in, sink);
    CborHead head;
    plist::ValueView value;
    ASSERT_TRUE(in.readHead(head));
    EXPECT_FALSE(reader.readScalar(head, value));
    EXPECT_STREQ(reader.trouble(), "a container where none can be");
  }
}

}  // namespace
}  // namespace tarn::wire
