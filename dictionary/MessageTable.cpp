// SPDX-License-Identifier: Apache-2.0
// The table of what can be said.
//
// Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this.
#include <array>

#include "dictionary/MessageDictionary.h"

namespace tarn::dictionary {

namespace {

// One entry a line.
// clang-format off

constexpr std::array<NamedNumber, 19> kCategories{{
    {0U, "Undefined", "No category. It has no name that parses.", false},
    {1U, "Generic", "What fits nowhere else.", true},
    {2U, "Record", "Recording, as an application sees it.", true},
    {3U, "Input", "The input side of a device or a stream; its Summary is derived.", true},
    {4U, "Playback", "Playback, as an application sees it.", true},
    {5U, "Output", "The output side of a device or a stream.", true},
    {6U, "PlaybackAndRecord", "Both at once.", true},
    {7U, "IO", "The cycle of input and output; its Error is an overload.", true},
    {8U, "Setup", "Settings and set-up. Markers and device settings of a session are of this category.", true},
    {9U, "ClientRequest", "What a program asked for.", true},
    {10U, "RouteChange", "Another device or port plays or records.", true},
    {11U, "Error", "Something went wrong. A message of this category is never redundant.", true},
    {12U, "Flume", "What drivers count; derived at the session's stop.", true},
    {13U, "Performance", "Load, overloads, late callbacks.", true},
    {14U, "Volume", "Volume; its Summary is derived.", true},
    {15U, "Lagoon", "Playback shared in a group; its Summary is derived.", true},
    {16U, "HearingHealth", "Exposure to sound.", true},
    {17U, "Tessels", "Registration of accessories.", false},
    {4294967295U, "Unknown", "What a text that is no category's name parses to.", true},
}};

constexpr std::array<NamedNumber, 6> kDomains{{
    {67108864U, "MIDI", "MIDI.", true},
    {134217728U, "Session", "The session itself; its Generic Summary is derived.", true},
    {268435456U, "DSP", "Signal processing.", true},
    {536870912U, "HAL", "The hardware layer.", true},
    {1073741824U, "Routing", "Routing.", true},
    {2147483648U, "Toolbox", "The tool box.", true},
}};

constexpr std::array<NamedNumber, 21> kTypes{{
    {0U, "Generic", "What fits nowhere else; also what an unknown name parses to.", true},
    {1U, "Start", "It begins.", true},
    {2U, "Stop", "It ends.", true},
    {3U, "Activate", "It becomes active.", true},
    {4U, "Deactivate", "It becomes inactive.", true},
    {5U, "Setup", "Settings.", true},
    {6U, "Error", "Something went wrong. A message of this type is never redundant.", true},
    {7U, "IssueDetector", "A fault that somebody heard or measured: one metric record each.", true},
    {8U, "Wattlog", "Facts about power: up to three power-log events each.", true},
    {9U, "AudioUnitUsage", "Which audio units are used.", true},
    {10U, "MIDIDriver", "A MIDI driver.", true},
    {11U, "Summary", "What a stretch of time comes to.", true},
    {12U, "HeadphoneAudioExposure", "Exposure through headphones.", true},
    {13U, "AudioExposure", "Exposure to sound around.", true},
    {14U, "Listeningenhancement", "Enhancement of listening; the e inside is lower case.", true},
    {15U, "Fennel", "Carried as it is; no worker looks for it.", true},
    {16U, "Simple", "Counters.", true},
    {17U, "Histogram", "Histograms.", true},
    {18U, "State", "How long states lasted.", true},
    {19U, "MemoryLog", "Asks for the memory log.", false},
    {65535U, "Unknown", "No type.", true},
}};

constexpr std::array<NamedNumber, 15> kServiceTypes{{
    {0U, "generic", "Anything.", true},
    {1U, "wisp", "A voice assistant.", true},
    {2U, "telephony", "A call.", true},
    {3U, "haptics", "Haptics.", true},
    {4U, "alarms", "An alarm. Only here, and in tests, quiet alarms are looked for.", true},
    {5U, "standalone", "A program on its own.", true},
    {6U, "soundautoconfig", "Sound that configures itself.", true},
    {7U, "longformaudio", "Music, films, podcasts.", true},
    {8U, "nonlongformaudio", "Short sounds of an application.", true},
    {9U, "audiodeviceusage", "How devices are used.", true},
    {10U, "alerts", "Alerts.", true},
    {11U, "test", "A test. It leaves a summary file and is not mirrored; on internal builds it may be traced.", true},
    {12U, "apiusage", "How interfaces are used. Its events are mirrored at once, not gathered.", true},
    {13U, "systemsounds", "Sounds of the system.", true},
    {65535U, "unknown", "No service type yet: what a session has before one is set.", true},
}};

constexpr std::array<MessageKey, 134> kKeys{{
    {"tarnreporting_timestamp", KeyKind::Number, "s since 1970", 0.0, 100000000000.0, true, false, "", "", "TarnReportingSession, TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker, TarnReportingSessionSystemMonitorWorker, TarnReportingSessionWattlogWorker, TarnReportingSessionRtcWorker", "TarnReportingSession, TarnReportingUtility", "When it happened. A missing one, or one that is more than a year old, is replaced by the time of arrival.", "The order of the log at the stop, and the length of every derived segment."},
    {"HostApplicationDisplayID", KeyKind::Text, "", -kUnbounded, kUnbounded, true, true, "", "", "TarnReportingSession, TarnReportingUtility, TarnReportingSessionDPWorker, TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "TarnReportingSession, TarnReportingService, TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionSummaryWorker", "The application that this is about. A message without it gets that of the session's configuration, and Unknown without one.", ""},
    {"KvHostApplicationDisplayID", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "TarnReportingSession", "", "Counts as HostApplicationDisplayID where the same dictionary doesn't have that.", ""},
    {"invalid_timestamp", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "The stamp that was replaced, or nil where there was none.", ""},
    {"audiotag", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "Category and type, joined: PlaybackStart.", ""},
    {"systemuptime_sec", KeyKind::Number, "s", 0.0, 10000000000.0, true, false, "", "", "TarnReportingSession, TarnReportingSessionSystemMonitorWorker", "TarnReportingUtility", "How long the device was up. Messages that differ in nothing else count as repeated.", ""},
    {"processuptime_ms", KeyKind::Number, "ms", 0.0, 10000000000000.0, true, false, "", "", "TarnReportingSession", "TarnReportingUtility", "Processor time that the process has used. Messages that differ in nothing else count as repeated.", ""},
    {"sendSingleMessage", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingService", "True: it came without reporter IDs (internal builds).", ""},
    {"isSessionStarted", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "YES, NO", "", "", "TarnReportingSessionSummaryJsonFileWorker", "Whether the session ran when the message came, in the summary file.", ""},
    {"session_output_running", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "StreamAdapters", "Output runs from this message on, or doesn't.", "Begins and ends a segment of Volume Summary and of Lagoon Summary."},
    {"KvSessionVolume", KeyKind::Number, "scalar", 0.0, 1.0, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, StreamAdapters", "The session's volume.", "A change while output runs ends a segment of Volume Summary. Without any volume there is none."},
    {"session_selected_format", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker, StreamAdapters", "The format that was chosen.", "A change while output runs ends a segment of Volume Summary."},
    {"active_devices", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker, TarnReportingSessionAudioRegistrationWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker, StreamAdapters", "The devices that play or record.", "A change ends a segment of Volume, Input and Lagoon Summary."},
    {"mFormatID", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker, StreamAdapters", "The identifier of the format, a text or a number.", "A change of a text ends a segment of Lagoon Summary; Volume Summary carries it."},
    {"mChannelsPerFrame", KeyKind::Integer, "channels", 0.0, 1024.0, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker, StreamAdapters", "Channels of a frame.", "A change ends a segment of Lagoon Summary; Volume Summary carries it. -1 where nobody told."},
    {"spatializationEnabled", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker", "TarnReportingSessionVolumeMessagesWorker", "Sound is placed in space.", "A change while output runs ends a segment of Volume Summary."},
    {"spatial-audio-accessory-feature", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionSystemMonitorWorker", "The device's setting for spatial sound with accessories; the service sends it too, as the setting is stored.", "Volume Summary carries it."},
    {"ringerstate", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionVolumeMessagesWorker", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionSystemMonitorWorker", "The ringer switch; the service sends it too.", "A change while output runs ends a segment of Volume Summary."},
    {"session_duration", KeyKind::Number, "s", 0.0, 100000000.0, true, false, "", "", "TarnReportingSessionSummaryWorker, TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "StreamAdapters", "The client's session is over and was active so long.", "Ends every segment that runs; counts in Session_Generic Summary."},
    {"lagoon_session", KeyKind::Integer, "", 0.0, 1.0, true, false, "", "", "TarnReportingSessionLagoonMessagesWorker", "StreamAdapters", "1: inside a group session.", "Only what plays while it is 1 makes a segment of Lagoon Summary."},
    {"session_input_running", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionInputMessagesWorker", "StreamAdapters", "Input runs from this message on, or doesn't.", "Begins and ends a segment of Input Summary."},
    {"vp_config_primary_vocoder", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionInputMessagesWorker", "StreamAdapters", "The voice codec.", "A change while input runs enters the codec and its rate into vocoders."},
    {"vp_config_primary_vocoderFs", KeyKind::Text, "Hz", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionInputMessagesWorker", "StreamAdapters", "The codec's sampling rate as a text, 16000.0; one that begins with 0. is no rate.", ""},
    {"vp_config_operation_mode", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionInputMessagesWorker", "TarnReportingSessionInputMessagesWorker", "How voice processing works.", "Input Summary carries it."},
    {"vp_config_input_port", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionInputMessagesWorker", "TarnReportingSessionInputMessagesWorker, StreamAdapters", "The port that voice processing records from.", "Input Summary carries it."},
    {"stream_run", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The number of the stream's run, from 1: no two runs have equal messages.", ""},
    {"restated", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "Said before, to a service that wasn't there any more: how the stream was all the time.", ""},
    {"end_reason", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "stream-ended, pipewire-ended, adapter-ended", "", "", "StreamAdapters", "Why the stream is over.", ""},
    {"volume_linear", KeyKind::Number, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The factor of the amplitude: the cube of where a mixer's slider stands.", ""},
    {"muted", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The stream is muted.", ""},
    {"channel_volumes", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The factors of the channels, with commas.", ""},
    {"device_volume", KeyKind::Number, "scalar", 0.0, 1.0, true, false, "", "", "", "StreamAdapters", "Where the slider of the sink or source stands.", ""},
    {"device_muted", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The sink or source is muted.", ""},
    {"device_bus", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "pci, usb, bluetooth, virtual", "", "", "StreamAdapters", "How the devices are connected, with commas.", ""},
    {"device_port", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "What is used of the devices, as analog-output-headphones.", ""},
    {"device_port_type", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The kinds of these ports, as headphones.", ""},
    {"device_form_factor", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "What the devices look like, as headset.", ""},
    {"device_profile", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "How the devices are used, as a2dp-sink.", ""},
    {"bluetooth_codec", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The codec of a Bluetooth device.", ""},
    {"device_is_default", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The first device is the one that the user chose.", ""},
    {"device_count", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "How many devices one stream plays to.", ""},
    {"sample_rate", KeyKind::Integer, "Hz", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The rate of the stream's own format.", ""},
    {"graph_quantum", KeyKind::Integer, "frames", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The cycle in which sound is passed on; ALSA's period.", ""},
    {"graph_rate", KeyKind::Integer, "Hz", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "The rate of the cycle.", ""},
    {"stream_latency_frames", KeyKind::Integer, "frames", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "What the stream asks for; ALSA's buffer.", ""},
    {"overload_cycles", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "Cycles that were missed in a row.", ""},
    {"overload_seconds", KeyKind::Number, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "How long the overload lasted.", ""},
    {"error_text", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "StreamAdapters", "What the system of audio says of an error.", ""},
    {"media_class", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "Stream/Output/Audio or Stream/Input/Audio.", ""},
    {"media_role", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "What the stream is for, as its program says: Music, Game.", ""},
    {"stream_node", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The stream's name in PipeWire; the sub-device of ALSA.", ""},
    {"application_process_binary", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The file that the stream's process runs, without its folder.", ""},
    {"application_process_id", KeyKind::Integer, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The number of the stream's process.", ""},
    {"portal_app_id", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The name of a sandboxed application.", ""},
    {"requested_latency", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The latency that the stream asks for, as 1024/48000.", ""},
    {"media_name", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "", "StreamAdapters", "The title; only where the configuration asks for it.", ""},
    {"issue_type", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "overload, LowRMS, node-error, device-error, link-error", "", "TarnReportingSessionSummaryWorker, TarnReportingSessionPylonWorker, TarnReportingSessionSnareWorker", "StreamAdapters", "What is wrong.", "overload counts in Session_Generic Summary; LowRMS in an alarm may lead to a bug capture; in type IssueDetector it is in the metric record."},
    {"node", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "*.IssueDetector", "TarnReportingSessionPylonWorker", "", "Where it is wrong.", "In the metric record, as a text."},
    {"rtaid_client", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "*.IssueDetector", "TarnReportingSessionPylonWorker", "", "Which client of real-time audio it concerns.", "In the metric record, as a text."},
    {"any_channel_silence_seconds", KeyKind::Number, "s", 0.0, 2147483647.0, true, false, "", "*.IssueDetector", "TarnReportingSessionPylonWorker", "", "How long a channel was silent.", "The duration of the metric record, in whole seconds."},
    {"smallest_buffer_frame_size", KeyKind::Integer, "frames", 0.0, 2147483647.0, true, false, "", "IO.Error", "TarnReportingSessionDPWorker", "StreamAdapters", "The smallest buffer at an overload.", "An overload with a buffer that is large enough leads to a trace of the stacks (internal builds)."},
    {"io_cycle", KeyKind::Integer, "cycles", 0.0, 2147483647.0, true, false, "", "IO.Error", "TarnReportingSessionDPWorker", "StreamAdapters", "The cycle of an overload.", ""},
    {"plac_invalid_*", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "TarnReportingSessionTattleWorker", "", "A call got coordinates that can't be.", "Prompts for a bug report (internal builds)."},
    {"EngineOnTime", KeyKind::Number, "s", 0.0, 100000000.0, true, false, "", "*.Wattlog", "TarnReportingSessionWattlogWorker", "", "How long the haptics engine was on.", "The power-log event Loom_Haptics_EngineOnDuration."},
    {"EngineState", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "EngineOn", "*.Wattlog", "TarnReportingSessionWattlogWorker", "", "EngineOn, or anything else for off.", "The power-log event Loom_Haptics_ClientStatus."},
    {"Haptic_Active_Hardware_Time_Seconds", KeyKind::Number, "s", 0.0, 100000000.0, true, false, "", "*.Wattlog", "TarnReportingSessionWattlogWorker, TarnReportingSessionSnareWorker", "TarnReportingSessionWattlogWorker", "A haptics session holds the hardware so long already.", "The power-log event LeakedHapticsSessionInfo; two of them a snapshot (internal builds with haptics)."},
    {"Active_Clients", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "*.Wattlog", "TarnReportingSessionWattlogWorker", "TarnReportingSessionWattlogWorker", "Who holds it.", ""},
    {"System_Sound_Stuck_Time_Seconds", KeyKind::Number, "s", 0.0, 100000000.0, true, false, "", "*.Wattlog", "TarnReportingSessionSnareWorker", "", "A system sound doesn't end for so long.", "A snapshot, at most one in 15 seconds (internal builds)."},
    {"EngineOnDuration", KeyKind::Number, "s", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionWattlogWorker", "EngineOnTime, as it came.", ""},
    {"Status", KeyKind::Integer, "", 0.0, 1.0, false, false, "", "", "", "TarnReportingSessionWattlogWorker", "1 for EngineOn, else 0.", ""},
    {"ApplicationName", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionWattlogWorker", "The application of the configuration.", ""},
    {"TimestampEnd", KeyKind::Number, "s since 1970", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionWattlogWorker", "The message's stamp.", ""},
    {"method", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "start, stop", "", "", "TarnReportingSession", "What was called.", ""},
    {"messages_at_start", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "Records in the session's log before the marker.", ""},
    {"unique_messages_at_start", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "The same number as messages_at_start: the log holds no repeated messages.", ""},
    {"running_at_start", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "YES, NO", "", "", "TarnReportingSession", "Whether the session ran before the call.", ""},
    {"messages_at_stop", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "Records in the session's log before the marker.", ""},
    {"unique_messages_at_stop", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "The same number as messages_at_stop: the log holds no repeated messages.", ""},
    {"running_at_stop", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "YES, NO", "", "", "TarnReportingSession", "Whether the session ran before the call.", ""},
    {"reporterid", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSession", "The session's reporter ID.", ""},
    {"total_active_time", KeyKind::Number, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The sum of session_duration.", ""},
    {"active_count", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Messages with session_duration.", ""},
    {"overload_count", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Messages without it whose issue_type is overload.", ""},
    {"average_active_time", KeyKind::Number, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "total_active_time over active_count, 0 without any.", ""},
    {"num_messages", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Messages since the last stop, repeated and derived ones included.", ""},
    {"num_unique_messages", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Records in the log, the markers included.", ""},
    {"num_redundant_messages", KeyKind::Integer, "messages", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "num_messages less num_unique_messages, as it comes out.", ""},
    {"singleMessageSession", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Whether it is the service's session for messages without one.", ""},
    {"summaryServiceName", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The name of the session's service type.", ""},
    {"clientProcessName", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The name of the client's process, when it is known.", ""},
    {"thermal_state", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "Nominal, Fair, Serious, Critical, Unknown", "", "", "TarnReportingSessionSummaryWorker", "The device's thermal state.", ""},
    {"low_power_enabled", KeyKind::Boolean, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Whether the device saves power.", ""},
    {"vmInfo_phys_footprint_MiB", KeyKind::Integer, "MiB", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "Memory of the service, when it is known.", ""},
    {"load_avg_1_min", KeyKind::Number, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The system's load average.", ""},
    {"load_avg_5_min", KeyKind::Number, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The system's load average.", ""},
    {"load_avg_15_min", KeyKind::Number, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSummaryWorker", "The system's load average.", ""},
    {"play_seconds", KeyKind::Number, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "How long the segment was, in single precision.", ""},
    {"play_secondsBucketed", KeyKind::Text, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000.", ""},
    {"KvSessionVolumeBucketed", KeyKind::Text, "scalar", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionVolumeMessagesWorker", "The nearest sixteenth, with at least one decimal: 0.5.", ""},
    {"inputrunning_seconds", KeyKind::Number, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionInputMessagesWorker", "How long the segment was, in single precision.", ""},
    {"inputrunning_secondsBucketed", KeyKind::Text, "s", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionInputMessagesWorker", "The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000.", ""},
    {"vocoders", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionInputMessagesWorker", "Codecs with their rates, CODEC:RATE, sorted, with commas; only when there are any.", ""},
    {"msgidx", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "The message's place among those of its kind that this stop derived, from 1.", ""},
    {"msgcnt", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionVolumeMessagesWorker, TarnReportingSessionInputMessagesWorker, TarnReportingSessionLagoonMessagesWorker", "How many messages of its kind this stop derived.", ""},
    {"device_name", KeyKind::Any, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSystemMonitorWorker", "The device's name, as the setting is stored.", ""},
    {"last_updated", KeyKind::Number, "s since 1970", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionSystemMonitorWorker", "When the service last read the setting.", ""},
    {"*_Simple_*", KeyKind::Integer, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionDriverSnapshotWorker", "DRIVER_GROUP_SUBGROUP_Simple_CHANNEL: how much the counter rose; less than 1 isn't told. Blanks and _ inside names are left out, and so is a part that a channel doesn't have.", ""},
    {"*_Histogram_*", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionDriverSnapshotWorker", "DRIVER_GROUP_SUBGROUP_Histogram_CHANNEL: count, lower, upper, min, max and unit, then LOWER-UPPER:HITS of each bucket with hits.", ""},
    {"*_State_*", KeyKind::Text, "", -kUnbounded, kUnbounded, true, false, "", "", "", "TarnReportingSessionDriverSnapshotWorker", "DRIVER_GROUP_SUBGROUP_State_CHANNEL: name, transition, residency and duty_cycle of each state that lasted.", ""},
    {"processName", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingService", "The name of a client's process, in the analytics event of its connection's end.", ""},
    {"seconds", KeyKind::Integer, "s", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingService", "How long it was connected.", ""},
    {"Tarn_Session_Summary_Event", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker", "The service type, leading the summary that ends a mirrored session. Each other key of it holds all values of that key in the session's messages, joined with commas.", ""},
    {"TarnReportingSessionID", KeyKind::Integer, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker", "The reporter ID.", ""},
    {"clientType", KeyKind::Integer, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "19, or 52 of a registration.", ""},
    {"clientVersion", KeyKind::Number, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "2.1.", ""},
    {"sessionID", KeyKind::Integer, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "The reporter ID.", ""},
    {"batchEvent", KeyKind::Boolean, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "Whether events may be gathered.", ""},
    {"hierarchyToken", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "What the back-end gave.", ""},
    {"containsRealtimeEvents", KeyKind::Boolean, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker", "The opposite of batchEvent.", ""},
    {"clientBundleID", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "HostApplicationDisplayID of the configuration, when it has one.", ""},
    {"clientName", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "sys.oxbow.tarnkit, or Tessels_Telemetry of a registration.", ""},
    {"serviceName", KeyKind::Text, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionRtcWorker, TarnReportingSessionAudioRegistrationWorker", "The service type's name and _session.", ""},
    {"TarnReportingSkeinPlistFilePath", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "TarnReportingSessionTraceWorker", "", "A property-list file that describes the probes; a session without it isn't traced.", ""},
    {"TarnReportingTraceType", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "sktrace_profile", "", "TarnReportingSessionTraceWorker", "", "sktrace_profile: trace template 3; anything else is template 2.", ""},
    {"TarnReportingSkeinOutputFileName", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "TarnReportingSessionTraceWorker", "", "The name of the perf-data file.", ""},
    {"TarnReportingSkeinOutputFileDirectory", KeyKind::Text, "", -kUnbounded, kUnbounded, false, true, "", "", "TarnReportingSessionTraceWorker", "", "Its directory, an absolute path.", ""},
    {"sys.oxbow.WattlogCore.VetchSysLogFilterProcess", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionSnareWorker", "A dictionary with processIDs.", ""},
    {"processIDs", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionSnareWorker", "The processes of the session's client.", ""},
    {"splunk", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionAudioRegistrationWorker", "The list of records.", ""},
    {"lastConnectedEpoch", KeyKind::Integer, "s since 1970", -kUnbounded, kUnbounded, false, false, "", "", "TarnReportingSessionAudioRegistrationWorker", "TarnReportingSessionAudioRegistrationWorker", "When the accessory was last connected.", ""},
    {"lastConnectedWW", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionAudioRegistrationWorker", "The same as a work week.", ""},
    {"Left", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionAudioRegistrationWorker", "What that part of the accessory tells.", ""},
    {"Right", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionAudioRegistrationWorker", "What that part of the accessory tells.", ""},
    {"Case", KeyKind::Any, "", -kUnbounded, kUnbounded, false, false, "", "", "", "TarnReportingSessionAudioRegistrationWorker", "What that part of the accessory tells.", ""},
}};

constexpr std::array<DerivedMessage, 13> kDerived{{
    {"Volume.Summary", "TarnReportingSessionVolumeMessagesWorker", "at the stop, one for each segment of more than 0.5 s in which output ran and a volume was known", "A segment ends where output stops, where the volume, the format, the devices, the placing in space or the ringer switch changes, and with session_duration. It tells the values as they were while it lasted. Messages with a spatial setting that come within 5 s of each other count as one.", "session_selected_format, mFormatID, active_devices, HostApplicationDisplayID, KvSessionVolume, KvSessionVolumeBucketed, play_seconds, spatial-audio-accessory-feature, spatializationEnabled, ringerstate, mChannelsPerFrame, play_secondsBucketed, msgidx, msgcnt", "A player starts at half volume on the speaker, is turned up after 20 s and stops 10 s later: two segments.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "longformaudio"}
{"op": "setConfiguration", "reporterID": 1, "configuration": {"HostApplicationDisplayID": "org.example.player"}}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Start", "message": {"session_output_running": true, "KvSessionVolume": 0.5, "active_devices": "Speaker", "tarnreporting_timestamp": 4102444800.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Volume", "type": "Generic", "message": {"KvSessionVolume": 0.75, "tarnreporting_timestamp": 4102444820.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Stop", "message": {"session_output_running": false, "tarnreporting_timestamp": 4102444830.0}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Volume.Summary", "payload": {"session_selected_format": "unknown", "mFormatID": "unknown", "active_devices": "Speaker", "HostApplicationDisplayID": "org.example.player", "KvSessionVolume": 0.5, "KvSessionVolumeBucketed": "0.5", "play_seconds": 20, "play_secondsBucketed": "30", "spatial-audio-accessory-feature": false, "spatializationEnabled": false, "ringerstate": false, "mChannelsPerFrame": -1, "msgidx": 1, "msgcnt": 2, "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "VolumeSummary"}}
{"backend": "tally", "name": "sys.oxbow.tarnkit.Volume.Summary", "payload": {"session_selected_format": "unknown", "mFormatID": "unknown", "active_devices": "Speaker", "HostApplicationDisplayID": "org.example.player", "KvSessionVolume": 0.75, "KvSessionVolumeBucketed": "0.75", "play_seconds": 10, "play_secondsBucketed": "10", "spatial-audio-accessory-feature": false, "spatializationEnabled": false, "ringerstate": false, "mChannelsPerFrame": -1, "msgidx": 2, "msgcnt": 2, "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "VolumeSummary"}}
)"},
    {"Input.Summary", "TarnReportingSessionInputMessagesWorker", "at the stop, one for each segment of more than 0.5 s in which input ran", "A segment ends where input stops, where the devices change, and with session_duration. vocoders tells the codecs that came up since the last such message. Before the first message each key has the latest value that the session has ever had, so a codec that never changes isn't told.", "HostApplicationDisplayID, inputrunning_seconds, inputrunning_secondsBucketed, msgidx, msgcnt, vp_config_operation_mode, vp_config_input_port, active_devices, vocoders", "A call records for a minute and goes over to another codec after 30 s.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "telephony"}
{"op": "setConfiguration", "reporterID": 1, "configuration": {"HostApplicationDisplayID": "org.example.call"}}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Input", "type": "Start", "message": {"session_input_running": true, "active_devices": "MicrophoneBuiltIn", "tarnreporting_timestamp": 4102444800.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Input", "type": "Setup", "message": {"vp_config_primary_vocoder": "amr-wb", "vp_config_primary_vocoderFs": "16000.0", "tarnreporting_timestamp": 4102444810.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Input", "type": "Setup", "message": {"vp_config_primary_vocoder": "opus", "vp_config_primary_vocoderFs": "48000.0", "tarnreporting_timestamp": 4102444830.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Input", "type": "Stop", "message": {"session_input_running": false, "tarnreporting_timestamp": 4102444860.0}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Input.Summary", "payload": {"HostApplicationDisplayID": "org.example.call", "inputrunning_seconds": 60, "inputrunning_secondsBucketed": "60", "msgidx": 1, "msgcnt": 1, "vp_config_operation_mode": "unknown", "vp_config_input_port": "unknown", "active_devices": "MicrophoneBuiltIn", "vocoders": "amr-wb:16000.0,opus:48000.0", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "InputSummary"}}
)"},
    {"Lagoon.Summary", "TarnReportingSessionLagoonMessagesWorker", "at the stop, one for each segment of more than 0.5 s in which output ran inside a group session", "A segment ends where output stops, where lagoon_session, the channels, the format's identifier or the devices change, and with session_duration. Before the first message each key has the latest value that the session has ever had, so a group that is never left makes no segment. But on internal builds only analytics events and summary files get it.", "session_selected_format, active_devices, mFormatID, mChannelsPerFrame, play_seconds, play_secondsBucketed, msgidx, msgcnt", "A player joins a group and leaves it 100 s later.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "longformaudio"}
{"op": "setConfiguration", "reporterID": 1, "configuration": {"HostApplicationDisplayID": "org.example.player"}}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Lagoon", "type": "Start", "message": {"session_output_running": true, "lagoon_session": 1, "mFormatID": "flac", "mChannelsPerFrame": 2, "tarnreporting_timestamp": 4102444800.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Lagoon", "type": "Stop", "message": {"lagoon_session": 0, "tarnreporting_timestamp": 4102444900.0}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Lagoon.Summary", "payload": {"session_selected_format": "unknown", "active_devices": "unknown", "mFormatID": "flac", "mChannelsPerFrame": 2, "play_seconds": 100, "play_secondsBucketed": "60", "msgidx": 1, "msgcnt": 1, "HostApplicationDisplayID": "org.example.player", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "LagoonSummary"}}
)"},
    {"Session_Generic.Summary", "TarnReportingSessionSummaryWorker", "at each stop of a session", "The times and counts of session_duration and of overloads are those of all periods of the session, the numbers of messages those of the one that ends.", "total_active_time, active_count, overload_count, average_active_time, num_messages, num_unique_messages, num_redundant_messages, singleMessageSession, summaryServiceName, HostApplicationDisplayID, clientProcessName, thermal_state, low_power_enabled, vmInfo_phys_footprint_MiB, load_avg_1_min, load_avg_5_min, load_avg_15_min", "Two stretches of activity and an overload. The log of four unique messages holds the two markers as well.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "nonlongformaudio"}
{"op": "setConfiguration", "reporterID": 1, "configuration": {"HostApplicationDisplayID": "org.example.player"}}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Summary", "message": {"session_duration": 3.0}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Performance", "type": "Generic", "message": {"issue_type": "overload"}}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Summary", "message": {"session_duration": 1.0}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Session_Generic.Summary", "payload": {"total_active_time": 4, "active_count": 2, "overload_count": 1, "average_active_time": 2, "num_messages": 3, "num_unique_messages": 5, "num_redundant_messages": -2, "singleMessageSession": false, "summaryServiceName": "nonlongformaudio", "HostApplicationDisplayID": "org.example.player", "clientProcessName": "tarnreportingctl", "thermal_state": "<text>", "low_power_enabled": "<any>", "vmInfo_phys_footprint_MiB": "<number>", "load_avg_1_min": "<number>", "load_avg_5_min": "<number>", "load_avg_15_min": "<number>", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "Session_GenericSummary"}}
)"},
    {"Setup.Setup", "TarnReportingSessionSystemMonitorWorker", "at the start, one for each setting that the device has, and whenever one changes while the session runs", "A message has one of the settings and when it was read.", "spatial-audio-accessory-feature, device_name, ringerstate, last_updated", "The device has a name.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "longformaudio"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Setup.Setup", "payload": {"device_name": "kitchen", "last_updated": "<now>", "HostApplicationDisplayID": "Unknown", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "SetupSetup"}}
)"},
    {"Flume.Simple", "TarnReportingSessionDriverSnapshotWorker", "at the stop, when a counter of a driver rose since the start", "The counters of all drivers that are looked at.", "*_Simple_*", "The haptics driver is switched on four times more.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "haptics"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "reporterID", "reporterID": 1}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Flume.Simple", "payload": {"OxbowFoo_Haptics_Stats_Simple_EngineOn": 4, "HostApplicationDisplayID": "Unknown", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "FlumeSimple"}}
)"},
    {"Flume.Histogram", "TarnReportingSessionDriverSnapshotWorker", "at the stop, when a histogram of a driver got hits since the start", "The histograms of all drivers that are looked at.", "*_Histogram_*", "Two latencies more between 50 and 100 us.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "haptics"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "reporterID", "reporterID": 1}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Flume.Histogram", "payload": {"OxbowFoo_Haptics_Stats_Histogram_Latency": "count=2,lower=0,upper=100,min=4,max=96,unit=us::50-100:2", "HostApplicationDisplayID": "Unknown", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "FlumeHistogram"}}
)"},
    {"Flume.State", "TarnReportingSessionDriverSnapshotWorker", "at the stop, when a state of a driver lasted for a while since the start", "The states of all drivers that are looked at.", "*_State_*", "The engine was on for 1500 ms more.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "haptics"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "reporterID", "reporterID": 1}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "tally", "name": "sys.oxbow.tarnkit.Flume.State", "payload": {"OxbowFoo_Haptics_Stats_State_Engine": "name:on,transition:3,residency:1500,duty_cycle:0.250000;", "HostApplicationDisplayID": "Unknown", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "FlumeState"}}
)"},
    {"Setup.Start", "TarnReportingSession", "at each start of a session, also of one that runs", "A marker in the session's log. No worker gets it as a message: it is in the summary file and in the summary of a mirrored session.", "method, messages_at_start, unique_messages_at_start, reporterid, running_at_start", "A test session leaves a summary file, whose first object is the marker.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "test"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "file", "name": "Setup_Start_1", "payload": {"method": "start", "messages_at_start": 0, "unique_messages_at_start": 0, "reporterid": 1, "running_at_start": "NO", "isSessionStarted": "NO", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "SetupStart"}}
)"},
    {"Setup.Stop", "TarnReportingSession", "at each stop of a session, also of one that doesn't run", "A marker in the session's log, as the other one.", "method, messages_at_stop, unique_messages_at_stop, reporterid, running_at_stop", "At the stop the log holds the other marker and one message.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "test"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Start", "message": {"session_output_running": true}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "file", "name": "Setup_Stop_1", "payload": {"method": "stop", "messages_at_stop": 2, "unique_messages_at_stop": 2, "reporterid": 1, "running_at_stop": "YES", "isSessionStarted": "NO", "tarnreporting_timestamp": "<now>", "invalid_timestamp": "nil", "audiotag": "SetupStop"}}
)"},
    {"Unknown.Unknown", "TarnReportingSessionRtcWorker", "at the stop of a mirrored session", "To the reporting service alone: all values of each key in the session's messages, joined with commas; values of different keys don't line up. Every session is mirrored but tests.", "Tarn_Session_Summary_Event", "One message, and the session's summary. The markers aren't among them: their isSessionStarted is NO.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "alerts"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sleep", "seconds": 0.2}
{"op": "sendMessage", "reporterIDs": [1], "category": "Playback", "type": "Start", "message": {"session_output_running": true}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "rtc", "name": "sendMessage", "detail": {"session": 1, "category": 65535, "type": 65535}, "payload": {"Tarn_Session_Summary_Event": "10", "session_output_running": "1", "invalid_timestamp": "nil,nil", "audiotag": "PlaybackStart,Session_GenericSummary", "HostApplicationDisplayID": "Unknown,Unknown", "total_active_time": "0", "active_count": "0", "overload_count": "0", "average_active_time": "0", "num_messages": "1", "num_unique_messages": "3", "num_redundant_messages": "-2", "singleMessageSession": "0", "summaryServiceName": "alerts", "clientProcessName": "tarnreportingctl", "thermal_state": "<text>", "low_power_enabled": "<text>", "vmInfo_phys_footprint_MiB": "<text>", "load_avg_1_min": "<text>", "load_avg_5_min": "<text>", "load_avg_15_min": "<text>"}}
)"},
    {"Loom_Haptics_EngineOnDuration, Loom_Haptics_ClientStatus, LeakedHapticsSessionInfo", "TarnReportingSessionWattlogWorker", "at once, for a message of type Wattlog", "Up to three power-log events, one for each of EngineOnTime, EngineState and Haptic_Active_Hardware_Time_Seconds that the message has.", "EngineOnDuration, ApplicationName, TimestampEnd, Status, Haptic_Active_Hardware_Time_Seconds, Active_Clients", "One message with all three.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "haptics"}
{"op": "setConfiguration", "reporterID": 1, "configuration": {"HostApplicationDisplayID": "org.example.rumble"}}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Output", "type": "Wattlog", "message": {"EngineOnTime": 2.5, "EngineState": "EngineOn", "Haptic_Active_Hardware_Time_Seconds": 90, "Active_Clients": 1, "tarnreporting_timestamp": 4102444800.0}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "wattlog", "name": "Loom_Haptics_EngineOnDuration", "payload": {"EngineOnDuration": 2.5, "ApplicationName": "org.example.rumble", "TimestampEnd": 4102444800.0}}
{"backend": "wattlog", "name": "Loom_Haptics_ClientStatus", "payload": {"Status": 1, "ApplicationName": "org.example.rumble", "TimestampEnd": 4102444800.0}}
{"backend": "wattlog", "name": "LeakedHapticsSessionInfo", "payload": {"Haptic_Active_Hardware_Time_Seconds": 90, "Active_Clients": 1}}
)"},
    {"5963779", "TarnReportingSessionPylonWorker", "at once, for a message of type IssueDetector", "One metric record, which has no keys of its own but four fields: issuetype, node, rtaidclient and duration.", "", "A mixer was silent for almost three seconds; the record has whole ones.", R"({"op": "createReportingSession", "reporterID": 1}
{"op": "setServiceType", "reporterID": 1, "serviceType": "longformaudio"}
{"op": "startReportingSessionForID", "reporterID": 1}
{"op": "sendMessage", "reporterIDs": [1], "category": "Performance", "type": "IssueDetector", "message": {"issue_type": "Silence", "node": "mixer", "rtaid_client": "music", "any_channel_silence_seconds": 2.9}}
{"op": "stopReportingSessionForID", "reporterID": 1}
)", R"({"backend": "pylon", "name": "5963779", "payload": {"duration": 2, "issuetype": "Silence", "node": "mixer", "rtaidclient": "music"}}
)"},
}};

constexpr std::array<KeyPart, 21> kParts{{
    {"TarnReportingSession", "The session: repairs what comes in, keeps its log, marks its start and stop."},
    {"TarnReportingUtility", "What all parts share: the application's name, dates for who asks for them."},
    {"TarnReportingService", "The service: finds the sessions that a message is for."},
    {"TarnReportingSessionVolumeMessagesWorker", "At the stop: how long output ran, at which volume, on which devices."},
    {"TarnReportingSessionInputMessagesWorker", "At the stop: how long input ran, on which devices, with which codecs."},
    {"TarnReportingSessionLagoonMessagesWorker", "At the stop: how long output ran in a group session."},
    {"TarnReportingSessionSummaryWorker", "At the stop: one summary of the session."},
    {"TarnReportingSessionSystemMonitorWorker", "At the start, and when one changes: the device's settings."},
    {"TarnReportingSessionDriverSnapshotWorker", "At the stop: what the drivers counted meanwhile."},
    {"TarnReportingSessionTallyWorker", "Hands each message to the analytics events, as it is."},
    {"TarnReportingSessionWattlogWorker", "Facts about power, from messages of type Wattlog."},
    {"TarnReportingSessionPylonWorker", "A metric record of each message of type IssueDetector."},
    {"TarnReportingSessionSnareWorker", "Asks for a bug capture (internal builds)."},
    {"TarnReportingSessionDPWorker", "Asks for a trace of the device's stacks at an overload (internal builds)."},
    {"TarnReportingSessionTattleWorker", "Prompts for a bug report (internal builds)."},
    {"TarnReportingSessionMemoryLogWorker", "Writes the memory log, for a message of type MemoryLog."},
    {"TarnReportingSessionSummaryJsonFileWorker", "At the stop: a file with all messages (tests and internal builds)."},
    {"TarnReportingSessionRtcWorker", "Mirrors the session to the reporting service of real-time communication."},
    {"TarnReportingSessionAudioRegistrationWorker", "Registers accessories. It declines every session, so none of this is sent."},
    {"TarnReportingSessionTraceWorker", "A performance trace of a test session (internal builds)."},
    {"StreamAdapters", "The programs that report the streams of PipeWire and ALSA: clients, beside the service."},
}};

// clang-format on

}  // namespace

std::span<const NamedNumber> categories() {
  return kCategories;
}

std::span<const NamedNumber> domains() {
  return kDomains;
}

std::span<const NamedNumber> types() {
  return kTypes;
}

std::span<const NamedNumber> serviceTypes() {
  return kServiceTypes;
}

std::span<const MessageKey> keys() {
  return kKeys;
}

std::span<const DerivedMessage> derived() {
  return kDerived;
}

std::span<const KeyPart> parts() {
  return kParts;
}

}  // namespace tarn::dictionary
