// SPDX-License-Identifier: Apache-2.0
// The reader of a message's fields, against looking for each key.
#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "derived/TarnReportingMessageFields.h"
#include "tests/support/Seeds.h"

namespace tarn {
namespace {

enum class Field : std::size_t { First, Second, Third, Count };
using Fields = TarnReportingMessageFields<Field>;

const Fields::Keys kKeys{plist::Key("first"), plist::Key("second"), plist::Key("third")};

void expectSame(const Fields& read, const Fields& looked, const std::string& where) {
  for (const Field field : {Field::First, Field::Second, Field::Third}) {
    EXPECT_EQ(read[field], looked[field]) << where;
  }
}

TEST(MessageFields, MergeTakesOverWhatTheLaterPayloadHoldsAndKeepsTheRest) {
  const plist::Dictionary earlier{{"first", 1}, {"second", 2}, {"third", 3}};
  for (const char* key : {"first", "second", "third"}) {
    const plist::Dictionary later{{key, "new"}};
    Fields fields(kKeys, earlier);
    fields.merge(Fields(kKeys, later));
    plist::Dictionary expected = earlier;
    expected.set(plist::Key(key), "new");
    expectSame(fields, Fields(kKeys, expected), key);
  }
}

TEST(MessageFieldReader, FindsFieldsInAnyOrderAmongOtherKeys) {
  TarnReportingMessageFieldReader<Field> reader(kKeys);
  const plist::Dictionary payload{{"x", 1}, {"third", 3}, {"y", "two"}, {"first", "one"}, {"z", plist::Array{1}}};
  const Fields fields = reader.read(payload);
  EXPECT_EQ(fields[Field::First].text(), "one");
  EXPECT_FALSE(fields[Field::Second].present());
  EXPECT_EQ(fields[Field::Third].signedValue(), 3);
}

TEST(MessageFieldReader, FindsNothingInAnEmptyPayload) {
  TarnReportingMessageFieldReader<Field> reader(kKeys);
  static_cast<void>(reader.read(plist::Dictionary{{"first", 1}}));
  const Fields fields = reader.read(plist::Dictionary());
  EXPECT_FALSE(fields[Field::First].present());
}

TEST(MessageFieldReader, ReadsEachPayloadOfOneShapeAnew) {
  TarnReportingMessageFieldReader<Field> reader(kKeys);
  for (int i = 0; i < 3; ++i) {
    const plist::Dictionary payload{{"text", std::string(static_cast<std::size_t>(i), 'x')}, {"second", i}};
    EXPECT_EQ(reader.read(payload)[Field::Second].signedValue(), i);
  }
}

TEST(MessageFieldReader, ReadsMoreShapesThanItRemembersAsASearchWould) {
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937 random(seed);
    const auto below = [&](std::uint32_t limit) { return static_cast<int>(random() % limit); };
    std::vector<plist::Dictionary> payloads;
    for (int shape = 0; shape < 1000; ++shape) {
      plist::Dictionary payload;
      for (int key = below(8); key >= 0; --key) {
        static const std::vector<std::string> kNames{"first", "second", "third", "other"};
        const int which = below(6);
        payload.set(
            plist::Key(which < 4 ? kNames[static_cast<std::size_t>(which)] : "key " + std::to_string(below(500))), key);
      }
      payloads.push_back(payload);
    }
    TarnReportingMessageFieldReader<Field> reader(kKeys);
    for (int i = 0; i < 5000; ++i) {
      const plist::Dictionary& payload = payloads[static_cast<std::size_t>(below(1000))];
      expectSame(reader.read(payload), Fields(kKeys, payload), plist::description(payload));
    }
  }
}

}  // namespace
}  // namespace tarn
