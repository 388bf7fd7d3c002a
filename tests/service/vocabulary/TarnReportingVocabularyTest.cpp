// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/TarnReportingVocabulary.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <utility>

namespace tarn {
namespace {

using namespace std::string_view_literals;

AudioEventCategory category(std::uint32_t value) {
  return static_cast<AudioEventCategory>(value);
}

constexpr std::pair<std::uint32_t, std::string_view> kCategories[] = {{1, "Generic"},
                                                                      {2, "Record"},
                                                                      {3, "Input"},
                                                                      {4, "Playback"},
                                                                      {5, "Output"},
                                                                      {6, "PlaybackAndRecord"},
                                                                      {7, "IO"},
                                                                      {8, "Setup"},
                                                                      {9, "ClientRequest"},
                                                                      {10, "RouteChange"},
                                                                      {11, "Error"},
                                                                      {12, "Flume"},
                                                                      {13, "Performance"},
                                                                      {14, "Volume"},
                                                                      {15, "Lagoon"},
                                                                      {16, "HearingHealth"},
                                                                      {17, "Tessels"}};

constexpr std::pair<std::uint16_t, std::string_view> kTypes[] = {{0, "Generic"},
                                                                 {1, "Start"},
                                                                 {2, "Stop"},
                                                                 {3, "Activate"},
                                                                 {4, "Deactivate"},
                                                                 {5, "Setup"},
                                                                 {6, "Error"},
                                                                 {7, "IssueDetector"},
                                                                 {8, "Wattlog"},
                                                                 {9, "AudioUnitUsage"},
                                                                 {10, "MIDIDriver"},
                                                                 {11, "Summary"},
                                                                 {12, "HeadphoneAudioExposure"},
                                                                 {13, "AudioExposure"},
                                                                 {14, "Listeningenhancement"},
                                                                 {15, "Fennel"},
                                                                 {16, "Simple"},
                                                                 {17, "Histogram"},
                                                                 {18, "State"},
                                                                 {19, "MemoryLog"},
                                                                 {65535, "Unknown"}};

constexpr std::pair<std::uint16_t, std::string_view> kServices[] = {
    {0, "generic"},          {1, "wisp"},          {2, "telephony"},
    {3, "haptics"},          {4, "alarms"},        {5, "standalone"},
    {6, "soundautoconfig"},  {7, "longformaudio"}, {8, "nonlongformaudio"},
    {9, "audiodeviceusage"}, {10, "alerts"},       {11, "test"},
    {12, "apiusage"},        {13, "systemsounds"}, {65535, "unknown"}};

TEST(TarnReportingVocabulary, EveryCategoryPrintsItsName) {
  for (const auto& [value, name] : kCategories) {
    EXPECT_EQ(TarnReportingUtilityCategoryString(category(value)), name);
  }
}

TEST(TarnReportingVocabulary, CategoriesOneToSixteenParseBack) {
  for (const auto& [value, name] : kCategories) {
    const auto expected = value <= 16 ? category(value) : AudioEventCategory::Unknown;
    EXPECT_EQ(TarnReportingUtilityCategoryFromString(name), expected) << name;
  }
}

TEST(TarnReportingVocabulary, CategoryZeroPrintsUndefined) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0)), "Undefined");
}

TEST(TarnReportingVocabulary, UnknownCategoryPrintsUndefinedWithoutDomain) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(AudioEventCategory::Unknown), "Undefined");
}

TEST(TarnReportingVocabulary, CategoriesAboveTheTablePrintUndefined) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(18)), "Undefined");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0xFFFF)), "Undefined");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x2000FFFF)), "HAL_Undefined");
}

TEST(TarnReportingVocabulary, EveryDomainPrintsAsPrefix) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x04000001)), "MIDI_Generic");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x08000001)), "Session_Generic");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x10000004)), "DSP_Playback");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x20000003)), "HAL_Input");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x4000000A)), "Routing_RouteChange");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x80000000)), "Toolbox_Undefined");
}

TEST(TarnReportingVocabulary, ToolboxTesselsPrintsButTesselsDoesNotParse) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x80000011)), "Toolbox_Tessels");
  EXPECT_EQ(TarnReportingUtilityCategoryFromString("Tessels"), AudioEventCategory::Unknown);
}

TEST(TarnReportingVocabulary, TwoDomainFlagsPrintABareUnderscore) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x0C000001)), "_Generic");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x30000004)), "_Playback");
}

TEST(TarnReportingVocabulary, UnknownHighHalfPrintsABareUnderscore) {
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x00010003)), "_Input");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0x00010000)), "_Undefined");
  EXPECT_EQ(TarnReportingUtilityCategoryString(category(0xFFFFFFFE)), "_Undefined");
}

TEST(TarnReportingVocabulary, CategoryTextsThatAreNotInTheTableParseToUnknown) {
  for (const std::string_view text : {"", "Undefined", "DSP_Playback", "_Input", "playback", "Playback ", "4"}) {
    EXPECT_EQ(TarnReportingUtilityCategoryFromString(text), AudioEventCategory::Unknown) << text;
  }
  EXPECT_EQ(TarnReportingUtilityCategoryFromString("Unknown"), AudioEventCategory::Unknown);
}

TEST(TarnReportingVocabulary, EveryTypePrintsItsName) {
  for (const auto& [value, name] : kTypes) {
    EXPECT_EQ(TarnReportingUtilityTypeString(static_cast<AudioEventType>(value)), name);
  }
}

TEST(TarnReportingVocabulary, TypeTwentyPrintsGeneric) {
  EXPECT_EQ(TarnReportingUtilityTypeString(static_cast<AudioEventType>(20)), "Generic");
  EXPECT_EQ(TarnReportingUtilityTypeString(static_cast<AudioEventType>(65534)), "Generic");
}

TEST(TarnReportingVocabulary, EveryTypeButMemoryLogParsesBack) {
  for (const auto& [value, name] : kTypes) {
    const auto expected = name == "MemoryLog" ? AudioEventType::Generic : static_cast<AudioEventType>(value);
    EXPECT_EQ(TarnReportingUtilityTypeFromString(name), expected) << name;
  }
}

TEST(TarnReportingVocabulary, TypeTextsOutsideTheTableParseToGeneric) {
  for (const std::string_view text : {"", "start", "ListeningEnhancement", "Summary ", "11"}) {
    EXPECT_EQ(TarnReportingUtilityTypeFromString(text), AudioEventType::Generic) << text;
  }
}

TEST(TarnReportingVocabulary, EveryServiceTypeGoesThereAndBack) {
  for (const auto& [value, name] : kServices) {
    const auto type = static_cast<AudioServiceType>(value);
    EXPECT_EQ(TarnReportingUtilityGenerateServiceNameFromServiceType(type), name);
    EXPECT_EQ(TarnReportingUtilityGenerateServiceTypeFromServiceName(name), type);
  }
}

TEST(TarnReportingVocabulary, ServiceTypeFourteenPrintsUnknown) {
  EXPECT_EQ(TarnReportingUtilityGenerateServiceNameFromServiceType(static_cast<AudioServiceType>(14)), "unknown");
  EXPECT_EQ(TarnReportingUtilityGenerateServiceNameFromServiceType(static_cast<AudioServiceType>(65534)), "unknown");
}

TEST(TarnReportingVocabulary, ServiceNameWithACapitalLetterParsesToUnknown) {
  EXPECT_EQ(TarnReportingUtilityGenerateServiceTypeFromServiceName("Generic"), AudioServiceType::Unknown);
  EXPECT_EQ(TarnReportingUtilityGenerateServiceTypeFromServiceName(""), AudioServiceType::Unknown);
}

TEST(TarnReportingVocabulary, TestModeIsOnExactlyInTheRangeOfDomains) {
  EXPECT_FALSE(TarnReportingUtilityIsABTestModeOn(category(0)));
  EXPECT_FALSE(TarnReportingUtilityIsABTestModeOn(category(0xFFFF)));
  EXPECT_TRUE(TarnReportingUtilityIsABTestModeOn(category(0x00010000)));
  EXPECT_TRUE(TarnReportingUtilityIsABTestModeOn(category(0x80000011)));
  EXPECT_TRUE(TarnReportingUtilityIsABTestModeOn(category(0xFFFFFFFE)));
  EXPECT_FALSE(TarnReportingUtilityIsABTestModeOn(category(0xFFFFFFFF)));
}

TEST(TarnReportingVocabulary, MessagesAreAlwaysSent) {
  EXPECT_TRUE(TarnReportingUtilityShouldSendMessage());
}

TEST(TarnReportingVocabulary, SessionIDIsTheReporterID) {
  EXPECT_EQ(TarnReportingUtilityExtractSessionIDFromReporterID(0), 0);
  EXPECT_EQ(TarnReportingUtilityExtractSessionIDFromReporterID(INT64_MIN), INT64_MIN);
  EXPECT_EQ(TarnReportingUtilityExtractSessionIDFromReporterID(INT64_MAX), INT64_MAX);
}

TEST(TarnReportingVocabulary, MinimumPlayingTimeIsHalfASecondForEveryServiceType) {
  for (const auto& [value, name] : kServices) {
    EXPECT_EQ(TarnReportingUtilityVolumeMinimumPlayingTime(static_cast<AudioServiceType>(value)), 0.5) << name;
  }
}

}  // namespace
}  // namespace tarn
