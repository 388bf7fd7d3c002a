// SPDX-License-Identifier: Apache-2.0
// The vocabulary: categories, types and service types of messages and sessions, their values and their strings.
//
// All of it is stateless. The string tables are built once, on first use; lookups take no lock. Threads: any.
//
// The printers and the parsers aren't inverses of each other: what clients send and what back-ends got from the
// beginning stays as it is, and each exception is told below. Any number may come from a client, so the enumerations
// hold numbers without a name too; nothing here fails.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tarn {

// Low 16 bits: the category proper; high 16 bits: an optional domain flag. Only the six flags below are domains, each
// alone: a high half with two of them has no name. A message with a flag is of another category than the same one
// without.
enum class AudioEventCategory : std::uint32_t {
  Undefined = 0,
  Generic = 1,
  Record = 2,
  Input = 3,
  Playback = 4,
  Output = 5,
  PlaybackAndRecord = 6,
  IO = 7,
  Setup = 8,
  ClientRequest = 9,
  RouteChange = 10,
  Error = 11,
  Flume = 12,
  Performance = 13,
  Volume = 14,
  Lagoon = 15,
  HearingHealth = 16,
  Tessels = 17,
  DomainMIDI = 0x04000000,
  DomainSession = 0x08000000,
  DomainDSP = 0x10000000,
  DomainHAL = 0x20000000,
  DomainRouting = 0x40000000,
  DomainToolbox = 0x80000000,
  SessionGeneric = 0x08000001,  // the session's own summary
  Unknown = 0xFFFFFFFF,
};

// With the category it tells what a message says; a session's log finds its latest message by the pair.
enum class AudioEventType : std::uint16_t {
  Generic = 0,
  Start = 1,
  Stop = 2,
  Activate = 3,
  Deactivate = 4,
  Setup = 5,
  Error = 6,
  IssueDetector = 7,
  Wattlog = 8,
  AudioUnitUsage = 9,
  MIDIDriver = 10,
  Summary = 11,
  HeadphoneAudioExposure = 12,
  AudioExposure = 13,
  ListeningEnhancement = 14,  // its string is "Listeningenhancement"
  Fennel = 15,
  Simple = 16,
  Histogram = 17,
  State = 18,
  MemoryLog = 19,
  Unknown = 65535,
};

// The type of a session decides which worker classes are made for it when it starts.
enum class AudioServiceType : std::uint16_t {
  Generic = 0,
  Wisp = 1,
  Telephony = 2,
  Haptics = 3,
  Alarms = 4,
  Standalone = 5,
  SoundAutoConfig = 6,
  LongFormAudio = 7,
  NonLongFormAudio = 8,
  AudioDeviceUsage = 9,
  Alerts = 10,
  Test = 11,
  APIUsage = 12,
  SystemSounds = 13,
  Unknown = 65535,
};

// "Playback" for 4, "DSP_Playback" for 0x10000004, "_Input" for an unknown domain over 3, "Undefined" for no category.
// Unknown has no domain and prints as "Undefined" too.
std::string TarnReportingUtilityCategoryString(AudioEventCategory category);
// The value of a plain category name. "Tessels", "Undefined" and domain-prefixed names are not known here and yield
// Unknown, although the printer writes them. The whole text, with its case; "Unknown" gives Unknown as well.
AudioEventCategory TarnReportingUtilityCategoryFromString(std::string_view string);

// "Generic" for every value without a name of its own, "Unknown" for 65535. The text is static.
std::string_view TarnReportingUtilityTypeString(AudioEventType type);
// Generic for every text that is not known; "MemoryLog" is not known here. The whole text, with its case; "Unknown"
// gives Unknown.
AudioEventType TarnReportingUtilityTypeFromString(std::string_view string);

// "unknown" for every value without a name. The text is static. Names are in lower case: "longformaudio" for 7.
std::string_view TarnReportingUtilityGenerateServiceNameFromServiceType(AudioServiceType serviceType);
// Unknown for every other text; case counts.
AudioServiceType TarnReportingUtilityGenerateServiceTypeFromServiceName(std::string_view name);

// Whether the category carries anything in its high half and is not Unknown. It doesn't matter whether the high half is
// a domain with a name.
bool TarnReportingUtilityIsABTestModeOn(AudioEventCategory category);
// Always true: the one place where messages could be held back on a whole device.
bool TarnReportingUtilityShouldSendMessage();
// A session's ID is its reporter ID.
std::int64_t TarnReportingUtilityExtractSessionIDFromReporterID(std::int64_t reporterID);
// Seconds that playback must last to count: 0.5 for every service type. Segments that are no longer than this are left
// out of what the volume, input and lagoon workers derive.
double TarnReportingUtilityVolumeMinimumPlayingTime(AudioServiceType serviceType);

}  // namespace tarn
