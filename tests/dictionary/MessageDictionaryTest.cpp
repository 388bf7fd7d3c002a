// SPDX-License-Identifier: Apache-2.0
#include "dictionary/MessageDictionary.h"

#include <gtest/gtest.h>

#include <string>

#include "service/vocabulary/TarnReportingVocabulary.h"

namespace tarn::dictionary {
namespace {

TEST(MessageDictionary, CategoriesAreThoseOfTheVocabulary) {
  for (const NamedNumber& row : categories()) {
    const auto category = static_cast<AudioEventCategory>(row.number);
    if (category != AudioEventCategory::Unknown) {  // which is printed as what has no name
      EXPECT_EQ(TarnReportingUtilityCategoryString(category), row.name);
    }
    EXPECT_EQ(TarnReportingUtilityCategoryFromString(row.name) == category, row.byName) << row.name;
  }
  for (std::uint32_t number = 0; number < 32; ++number) {
    const std::string name = TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(number));
    EXPECT_EQ(rowOf(categories(), number) != nullptr, number == 0 || name != "Undefined") << number;
  }
}

TEST(MessageDictionary, DomainsLeadTheNamesOfCategories) {
  for (const NamedNumber& row : domains()) {
    EXPECT_EQ(TarnReportingUtilityCategoryString(static_cast<AudioEventCategory>(row.number | 4U)),
              std::string(row.name) + "_Playback");
  }
  EXPECT_EQ(domains().size(), 6U);
}

TEST(MessageDictionary, TypesAreThoseOfTheVocabulary) {
  for (const NamedNumber& row : types()) {
    const auto type = static_cast<AudioEventType>(row.number);
    EXPECT_EQ(TarnReportingUtilityTypeString(type), row.name);
    EXPECT_EQ(TarnReportingUtilityTypeFromString(row.name) == type, row.byName) << row.name;
  }
  for (std::uint32_t number = 1; number < 32; ++number) {
    const bool isNamed = TarnReportingUtilityTypeString(static_cast<AudioEventType>(number)) != "Generic";
    EXPECT_EQ(rowOf(types(), number) != nullptr, isNamed) << number;
  }
}

TEST(MessageDictionary, ServiceTypesAreThoseOfTheVocabulary) {
  for (const NamedNumber& row : serviceTypes()) {
    const auto type = static_cast<AudioServiceType>(row.number);
    EXPECT_EQ(TarnReportingUtilityGenerateServiceNameFromServiceType(type), row.name);
    EXPECT_EQ(TarnReportingUtilityGenerateServiceTypeFromServiceName(row.name) == type, row.byName) << row.name;
  }
  for (std::uint32_t number = 0; number < 32; ++number) {
    const auto type = static_cast<AudioServiceType>(number);
    const bool isNamed = TarnReportingUtilityGenerateServiceNameFromServiceType(type) != "unknown";
    EXPECT_EQ(rowOf(serviceTypes(), number) != nullptr, isNamed) << number;
  }
}

TEST(MessageDictionary, AKeyIsFoundByItsName) {
  const MessageKey* key = keyOf("KvSessionVolume");
  ASSERT_NE(key, nullptr);
  EXPECT_EQ(key->name, "KvSessionVolume");
  EXPECT_EQ(key->kind, KeyKind::Number);
  EXPECT_EQ(key->unit, "scalar");
  EXPECT_EQ(key->least, 0.0);
  EXPECT_EQ(key->greatest, 1.0);
  EXPECT_TRUE(key->inMessages);
  EXPECT_FALSE(key->inConfigurations);
  EXPECT_TRUE(lists(key->readers, "TarnReportingSessionVolumeMessagesWorker"));
  EXPECT_EQ(keyOf("KvSessionVolum"), nullptr);
  EXPECT_EQ(keyOf("KvSessionVolumes"), nullptr);
  EXPECT_EQ(keyOf(""), nullptr);
}

TEST(MessageDictionary, APatternStandsForNamesWithATextInThePlaceOfEachStar) {
  ASSERT_NE(keyOf("plac_invalid_x"), nullptr);
  EXPECT_EQ(keyOf("plac_invalid_x")->name, "plac_invalid_*");
  EXPECT_EQ(keyOf("plac_invalid_"), nullptr);
  EXPECT_EQ(keyOf("a_plac_invalid_x"), nullptr);
  ASSERT_NE(keyOf("Foo_Haptics_Simple_On"), nullptr);
  EXPECT_EQ(keyOf("Foo_Haptics_Simple_On")->name, "*_Simple_*");
  EXPECT_EQ(keyOf("_Simple_On"), nullptr);
  EXPECT_EQ(keyOf("Foo_Simple_"), nullptr);
}

TEST(MessageDictionary, AListHoldsWholeNames) {
  EXPECT_TRUE(lists("a, bc, d", "a"));
  EXPECT_TRUE(lists("a, bc, d", "bc"));
  EXPECT_TRUE(lists("a, bc, d", "d"));
  EXPECT_FALSE(lists("a, bc, d", "b"));
  EXPECT_FALSE(lists("a, bc, d", "c"));
  EXPECT_FALSE(lists("", "a"));
}

TEST(MessageDictionary, EveryDerivedMessageHasAScriptAndWhatIsRecorded) {
  EXPECT_FALSE(derived().empty());
  for (const DerivedMessage& message : derived()) {
    EXPECT_TRUE(message.script.starts_with("{\"op\": \"createReportingSession\"")) << message.name;
    EXPECT_TRUE(message.script.ends_with("}\n")) << message.name;
    EXPECT_TRUE(message.recorded.starts_with("{\"backend\"")) << message.name;
  }
}

TEST(MessageDictionary, KindsHaveTheNamesOfTheTable) {
  EXPECT_EQ(nameOf(KeyKind::Boolean), "boolean");
  EXPECT_EQ(nameOf(KeyKind::Integer), "integer");
  EXPECT_EQ(nameOf(KeyKind::Number), "number");
  EXPECT_EQ(nameOf(KeyKind::Text), "text");
  EXPECT_EQ(nameOf(KeyKind::Any), "any");
}

TEST(MessageDictionary, AMeasureIsKindUnitAndRange) {
  EXPECT_EQ(measureOf(*keyOf("KvSessionVolume")), "number, scalar, 0 to 1");
  EXPECT_EQ(measureOf(*keyOf("session_output_running")), "boolean");
  EXPECT_EQ(measureOf(*keyOf("vp_config_primary_vocoderFs")), "text, Hz");
  EXPECT_EQ(rangeOf(*keyOf("tarnreporting_timestamp")), "0 to 100000000000");
}

TEST(MessageDictionary, NumbersAreWrittenForPeople) {
  EXPECT_EQ(numberText(0.55), "0.55");
  EXPECT_EQ(numberText(-6.5), "-6.5");
  EXPECT_EQ(numberText(4102444800000.0), "4102444800000");
  EXPECT_EQ(numberText(1e20), "1e+20");
}

}  // namespace
}  // namespace tarn::dictionary
