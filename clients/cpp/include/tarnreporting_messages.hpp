// SPDX-License-Identifier: Apache-2.0
// What can be said: numbers and keys of messages, for C++17 and later. docs/messages.md tells more.
//
// Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this.
#pragma once

#include <cstdint>
#include <string_view>

namespace tarnreporting {

// Categories.
enum class Category : std::uint32_t {
  // No category. It has no name that parses.
  Undefined = 0,
  // What fits nowhere else.
  Generic = 1,
  // Recording, as an application sees it.
  Record = 2,
  // The input side of a device or a stream; its Summary is derived.
  Input = 3,
  // Playback, as an application sees it.
  Playback = 4,
  // The output side of a device or a stream.
  Output = 5,
  // Both at once.
  PlaybackAndRecord = 6,
  // The cycle of input and output; its Error is an overload.
  IO = 7,
  // Settings and set-up. Markers and device settings of a session are of this category.
  Setup = 8,
  // What a program asked for.
  ClientRequest = 9,
  // Another device or port plays or records.
  RouteChange = 10,
  // Something went wrong. A message of this category is never redundant.
  Error = 11,
  // What drivers count; derived at the session's stop.
  Flume = 12,
  // Load, overloads, late callbacks.
  Performance = 13,
  // Volume; its Summary is derived.
  Volume = 14,
  // Playback shared in a group; its Summary is derived.
  Lagoon = 15,
  // Exposure to sound.
  HearingHealth = 16,
  // Registration of accessories.
  Tessels = 17,
  // What a text that is no category's name parses to.
  Unknown = 4294967295,
};

// Domains: Domain::DSP | Category::Playback.
enum class Domain : std::uint32_t {
  // MIDI.
  MIDI = 0x04000000,
  // The session itself; its Generic Summary is derived.
  Session = 0x08000000,
  // Signal processing.
  DSP = 0x10000000,
  // The hardware layer.
  HAL = 0x20000000,
  // Routing.
  Routing = 0x40000000,
  // The tool box.
  Toolbox = 0x80000000,
};

constexpr Category operator|(Domain domain, Category category) noexcept {
  return static_cast<Category>(static_cast<std::uint32_t>(domain) | static_cast<std::uint32_t>(category));
}

// Types.
enum class Type : std::uint16_t {
  // What fits nowhere else; also what an unknown name parses to.
  Generic = 0,
  // It begins.
  Start = 1,
  // It ends.
  Stop = 2,
  // It becomes active.
  Activate = 3,
  // It becomes inactive.
  Deactivate = 4,
  // Settings.
  Setup = 5,
  // Something went wrong. A message of this type is never redundant.
  Error = 6,
  // A fault that somebody heard or measured: one metric record each.
  IssueDetector = 7,
  // Facts about power: up to three power-log events each.
  Wattlog = 8,
  // Which audio units are used.
  AudioUnitUsage = 9,
  // A MIDI driver.
  MIDIDriver = 10,
  // What a stretch of time comes to.
  Summary = 11,
  // Exposure through headphones.
  HeadphoneAudioExposure = 12,
  // Exposure to sound around.
  AudioExposure = 13,
  // Enhancement of listening; the e inside is lower case.
  ListeningEnhancement = 14,
  // Carried as it is; no worker looks for it.
  Fennel = 15,
  // Counters.
  Simple = 16,
  // Histograms.
  Histogram = 17,
  // How long states lasted.
  State = 18,
  // Asks for the memory log.
  MemoryLog = 19,
  // No type.
  Unknown = 65535,
};

// Service types.
enum class ServiceType : std::uint16_t {
  // Anything.
  Generic = 0,
  // A voice assistant.
  Wisp = 1,
  // A call.
  Telephony = 2,
  // Haptics.
  Haptics = 3,
  // An alarm. Only here, and in tests, quiet alarms are looked for.
  Alarms = 4,
  // A program on its own.
  Standalone = 5,
  // Sound that configures itself.
  SoundAutoConfig = 6,
  // Music, films, podcasts.
  LongFormAudio = 7,
  // Short sounds of an application.
  NonLongFormAudio = 8,
  // How devices are used.
  AudioDeviceUsage = 9,
  // Alerts.
  Alerts = 10,
  // A test. It leaves a summary file and is not mirrored; on internal builds it may be traced.
  Test = 11,
  // How interfaces are used. Its events are mirrored at once, not gathered.
  APIUsage = 12,
  // Sounds of the system.
  SystemSounds = 13,
  // No service type yet: what a session has before one is set.
  Unknown = 65535,
};

namespace keys {

// Every message.
// When it happened. A missing one, or one that is more than a year old, is replaced by the time of arrival. (number, s
// since 1970, 0 to 100000000000)
inline constexpr std::string_view kTarnreportingTimestamp = "tarnreporting_timestamp";
// The application that this is about. A message without it gets that of the session's configuration, and Unknown
// without one. (text)
inline constexpr std::string_view kHostApplicationDisplayID = "HostApplicationDisplayID";
// Counts as HostApplicationDisplayID where the same dictionary doesn't have that. (text)
inline constexpr std::string_view kKvHostApplicationDisplayID = "KvHostApplicationDisplayID";
// The stamp that was replaced, or nil where there was none. (any)
inline constexpr std::string_view kInvalidTimestamp = "invalid_timestamp";
// Category and type, joined: PlaybackStart. (text)
inline constexpr std::string_view kAudiotag = "audiotag";
// How long the device was up. Messages that differ in nothing else count as repeated. (number, s, 0 to 10000000000)
inline constexpr std::string_view kSystemuptimeSec = "systemuptime_sec";
// Processor time that the process has used. Messages that differ in nothing else count as repeated. (number, ms, 0 to
// 10000000000000)
inline constexpr std::string_view kProcessuptimeMs = "processuptime_ms";
// True: it came without reporter IDs (internal builds). (boolean)
inline constexpr std::string_view kSendSingleMessage = "sendSingleMessage";
// Whether the session ran when the message came, in the summary file. (text)
inline constexpr std::string_view kIsSessionStarted = "isSessionStarted";

// Output, volume and route.
// Output runs from this message on, or doesn't. (boolean)
inline constexpr std::string_view kSessionOutputRunning = "session_output_running";
// The session's volume. (number, scalar, 0 to 1)
inline constexpr std::string_view kKvSessionVolume = "KvSessionVolume";
// The format that was chosen. (text)
inline constexpr std::string_view kSessionSelectedFormat = "session_selected_format";
// The devices that play or record. (text)
inline constexpr std::string_view kActiveDevices = "active_devices";
// The identifier of the format, a text or a number. (any)
inline constexpr std::string_view kMFormatID = "mFormatID";
// Channels of a frame. (integer, channels, 0 to 1024)
inline constexpr std::string_view kMChannelsPerFrame = "mChannelsPerFrame";
// Sound is placed in space. (boolean)
inline constexpr std::string_view kSpatializationEnabled = "spatializationEnabled";
// The device's setting for spatial sound with accessories; the service sends it too, as the setting is stored.
// (boolean)
inline constexpr std::string_view kSpatialAudioAccessoryFeature = "spatial-audio-accessory-feature";
// The ringer switch; the service sends it too. (boolean)
inline constexpr std::string_view kRingerstate = "ringerstate";
// The client's session is over and was active so long. (number, s, 0 to 100000000)
inline constexpr std::string_view kSessionDuration = "session_duration";
// 1: inside a group session. (integer, 0 to 1)
inline constexpr std::string_view kLagoonSession = "lagoon_session";

// Input.
// Input runs from this message on, or doesn't. (boolean)
inline constexpr std::string_view kSessionInputRunning = "session_input_running";
// The voice codec. (text)
inline constexpr std::string_view kVpConfigPrimaryVocoder = "vp_config_primary_vocoder";
// The codec's sampling rate as a text, 16000.0; one that begins with 0. is no rate. (text, Hz)
inline constexpr std::string_view kVpConfigPrimaryVocoderFs = "vp_config_primary_vocoderFs";
// How voice processing works. (any)
inline constexpr std::string_view kVpConfigOperationMode = "vp_config_operation_mode";
// The port that voice processing records from. (any)
inline constexpr std::string_view kVpConfigInputPort = "vp_config_input_port";

// Streams that adapters report.
// The number of the stream's run, from 1: no two runs have equal messages. (integer)
inline constexpr std::string_view kStreamRun = "stream_run";
// Said before, to a service that wasn't there any more: how the stream was all the time. (boolean)
inline constexpr std::string_view kRestated = "restated";
// Why the stream is over. (text)
inline constexpr std::string_view kEndReason = "end_reason";
// The factor of the amplitude: the cube of where a mixer's slider stands. (number)
inline constexpr std::string_view kVolumeLinear = "volume_linear";
// The stream is muted. (boolean)
inline constexpr std::string_view kMuted = "muted";
// The factors of the channels, with commas. (text)
inline constexpr std::string_view kChannelVolumes = "channel_volumes";
// Where the slider of the sink or source stands. (number, scalar, 0 to 1)
inline constexpr std::string_view kDeviceVolume = "device_volume";
// The sink or source is muted. (boolean)
inline constexpr std::string_view kDeviceMuted = "device_muted";
// How the devices are connected, with commas. (text)
inline constexpr std::string_view kDeviceBus = "device_bus";
// What is used of the devices, as analog-output-headphones. (text)
inline constexpr std::string_view kDevicePort = "device_port";
// The kinds of these ports, as headphones. (text)
inline constexpr std::string_view kDevicePortType = "device_port_type";
// What the devices look like, as headset. (text)
inline constexpr std::string_view kDeviceFormFactor = "device_form_factor";
// How the devices are used, as a2dp-sink. (text)
inline constexpr std::string_view kDeviceProfile = "device_profile";
// The codec of a Bluetooth device. (text)
inline constexpr std::string_view kBluetoothCodec = "bluetooth_codec";
// The first device is the one that the user chose. (boolean)
inline constexpr std::string_view kDeviceIsDefault = "device_is_default";
// How many devices one stream plays to. (integer)
inline constexpr std::string_view kDeviceCount = "device_count";
// The rate of the stream's own format. (integer, Hz)
inline constexpr std::string_view kSampleRate = "sample_rate";
// The cycle in which sound is passed on; ALSA's period. (integer, frames)
inline constexpr std::string_view kGraphQuantum = "graph_quantum";
// The rate of the cycle. (integer, Hz)
inline constexpr std::string_view kGraphRate = "graph_rate";
// What the stream asks for; ALSA's buffer. (integer, frames)
inline constexpr std::string_view kStreamLatencyFrames = "stream_latency_frames";
// Cycles that were missed in a row. (integer)
inline constexpr std::string_view kOverloadCycles = "overload_cycles";
// How long the overload lasted. (number, s)
inline constexpr std::string_view kOverloadSeconds = "overload_seconds";
// What the system of audio says of an error. (text)
inline constexpr std::string_view kErrorText = "error_text";
// Stream/Output/Audio or Stream/Input/Audio. (text)
inline constexpr std::string_view kMediaClass = "media_class";
// What the stream is for, as its program says: Music, Game. (text)
inline constexpr std::string_view kMediaRole = "media_role";
// The stream's name in PipeWire; the sub-device of ALSA. (text)
inline constexpr std::string_view kStreamNode = "stream_node";
// The file that the stream's process runs, without its folder. (text)
inline constexpr std::string_view kApplicationProcessBinary = "application_process_binary";
// The number of the stream's process. (integer)
inline constexpr std::string_view kApplicationProcessId = "application_process_id";
// The name of a sandboxed application. (text)
inline constexpr std::string_view kPortalAppId = "portal_app_id";
// The latency that the stream asks for, as 1024/48000. (text)
inline constexpr std::string_view kRequestedLatency = "requested_latency";
// The title; only where the configuration asks for it. (text)
inline constexpr std::string_view kMediaName = "media_name";

// Faults.
// What is wrong. (text)
inline constexpr std::string_view kIssueType = "issue_type";
// Where it is wrong. (any)
inline constexpr std::string_view kNode = "node";
// Which client of real-time audio it concerns. (any)
inline constexpr std::string_view kRtaidClient = "rtaid_client";
// How long a channel was silent. (number, s, 0 to 2147483647)
inline constexpr std::string_view kAnyChannelSilenceSeconds = "any_channel_silence_seconds";
// The smallest buffer at an overload. (integer, frames, 0 to 2147483647)
inline constexpr std::string_view kSmallestBufferFrameSize = "smallest_buffer_frame_size";
// The cycle of an overload. (integer, cycles, 0 to 2147483647)
inline constexpr std::string_view kIoCycle = "io_cycle";
// A call got coordinates that can't be. (any)
inline constexpr std::string_view kPlacInvalidPrefix = "plac_invalid_";

// Power.
// How long the haptics engine was on. (number, s, 0 to 100000000)
inline constexpr std::string_view kEngineOnTime = "EngineOnTime";
// EngineOn, or anything else for off. (text)
inline constexpr std::string_view kEngineState = "EngineState";
// A haptics session holds the hardware so long already. (number, s, 0 to 100000000)
inline constexpr std::string_view kHapticActiveHardwareTimeSeconds = "Haptic_Active_Hardware_Time_Seconds";
// Who holds it. (any)
inline constexpr std::string_view kActiveClients = "Active_Clients";
// A system sound doesn't end for so long. (number, s, 0 to 100000000)
inline constexpr std::string_view kSystemSoundStuckTimeSeconds = "System_Sound_Stuck_Time_Seconds";

// Markers of a session's start and stop.
// What was called. (text)
inline constexpr std::string_view kMethod = "method";
// Records in the session's log before the marker. (integer, messages)
inline constexpr std::string_view kMessagesAtStart = "messages_at_start";
// The same number as messages_at_start: the log holds no repeated messages. (integer, messages)
inline constexpr std::string_view kUniqueMessagesAtStart = "unique_messages_at_start";
// Whether the session ran before the call. (text)
inline constexpr std::string_view kRunningAtStart = "running_at_start";
// Records in the session's log before the marker. (integer, messages)
inline constexpr std::string_view kMessagesAtStop = "messages_at_stop";
// The same number as messages_at_stop: the log holds no repeated messages. (integer, messages)
inline constexpr std::string_view kUniqueMessagesAtStop = "unique_messages_at_stop";
// Whether the session ran before the call. (text)
inline constexpr std::string_view kRunningAtStop = "running_at_stop";
// The session's reporter ID. (integer)
inline constexpr std::string_view kReporterid = "reporterid";

// Summary of a session.
// The sum of session_duration. (number, s)
inline constexpr std::string_view kTotalActiveTime = "total_active_time";
// Messages with session_duration. (integer, messages)
inline constexpr std::string_view kActiveCount = "active_count";
// Messages without it whose issue_type is overload. (integer, messages)
inline constexpr std::string_view kOverloadCount = "overload_count";
// total_active_time over active_count, 0 without any. (number, s)
inline constexpr std::string_view kAverageActiveTime = "average_active_time";
// Messages since the last stop, repeated and derived ones included. (integer, messages)
inline constexpr std::string_view kNumMessages = "num_messages";
// Records in the log, the markers included. (integer, messages)
inline constexpr std::string_view kNumUniqueMessages = "num_unique_messages";
// num_messages less num_unique_messages, as it comes out. (integer, messages)
inline constexpr std::string_view kNumRedundantMessages = "num_redundant_messages";
// Whether it is the service's session for messages without one. (boolean)
inline constexpr std::string_view kSingleMessageSession = "singleMessageSession";
// The name of the session's service type. (text)
inline constexpr std::string_view kSummaryServiceName = "summaryServiceName";
// The name of the client's process, when it is known. (text)
inline constexpr std::string_view kClientProcessName = "clientProcessName";
// The device's thermal state. (text)
inline constexpr std::string_view kThermalState = "thermal_state";
// Whether the device saves power. (boolean)
inline constexpr std::string_view kLowPowerEnabled = "low_power_enabled";
// Memory of the service, when it is known. (integer, MiB)
inline constexpr std::string_view kVmInfoPhysFootprintMib = "vmInfo_phys_footprint_MiB";
// The system's load average. (number)
inline constexpr std::string_view kLoadAvg1Min = "load_avg_1_min";
// The system's load average. (number)
inline constexpr std::string_view kLoadAvg5Min = "load_avg_5_min";
// The system's load average. (number)
inline constexpr std::string_view kLoadAvg15Min = "load_avg_15_min";

// Summaries of segments.
// How long the segment was, in single precision. (number, s)
inline constexpr std::string_view kPlaySeconds = "play_seconds";
// The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000. (text, s)
inline constexpr std::string_view kPlaySecondsBucketed = "play_secondsBucketed";
// The nearest sixteenth, with at least one decimal: 0.5. (text, scalar)
inline constexpr std::string_view kKvSessionVolumeBucketed = "KvSessionVolumeBucketed";
// How long the segment was, in single precision. (number, s)
inline constexpr std::string_view kInputrunningSeconds = "inputrunning_seconds";
// The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000. (text, s)
inline constexpr std::string_view kInputrunningSecondsBucketed = "inputrunning_secondsBucketed";
// Codecs with their rates, CODEC:RATE, sorted, with commas; only when there are any. (text)
inline constexpr std::string_view kVocoders = "vocoders";
// The message's place among those of its kind that this stop derived, from 1. (integer)
inline constexpr std::string_view kMsgidx = "msgidx";
// How many messages of its kind this stop derived. (integer)
inline constexpr std::string_view kMsgcnt = "msgcnt";

// Settings of the device.
// The device's name, as the setting is stored. (any)
inline constexpr std::string_view kDeviceName = "device_name";
// When the service last read the setting. (number, s since 1970)
inline constexpr std::string_view kLastUpdated = "last_updated";

// Traced test sessions.
// A property-list file that describes the probes; a session without it isn't traced. (text)
inline constexpr std::string_view kTarnReportingSkeinPlistFilePath = "TarnReportingSkeinPlistFilePath";
// sktrace_profile: trace template 3; anything else is template 2. (text)
inline constexpr std::string_view kTarnReportingTraceType = "TarnReportingTraceType";
// The name of the perf-data file. (text)
inline constexpr std::string_view kTarnReportingSkeinOutputFileName = "TarnReportingSkeinOutputFileName";
// Its directory, an absolute path. (text)
inline constexpr std::string_view kTarnReportingSkeinOutputFileDirectory = "TarnReportingSkeinOutputFileDirectory";

}  // namespace keys

}  // namespace tarnreporting
