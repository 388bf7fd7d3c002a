// SPDX-License-Identifier: Apache-2.0
/* What can be said: numbers and keys of messages, each after what it means, a key with its kind, unit
 * and range. docs/messages.md tells who reads and writes them. Constants alone: no library is needed.
 *
 * Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this. */
#pragma once

#include <stdint.h>

/* clang-format off */

/* Categories. A domain may be added: TARN_DOMAIN_DSP | TARN_CATEGORY_PLAYBACK. */

/* No category. It has no name that parses. */
#define TARN_CATEGORY_UNDEFINED UINT32_C(0)
/* What fits nowhere else. */
#define TARN_CATEGORY_GENERIC UINT32_C(1)
/* Recording, as an application sees it. */
#define TARN_CATEGORY_RECORD UINT32_C(2)
/* The input side of a device or a stream; its Summary is derived. */
#define TARN_CATEGORY_INPUT UINT32_C(3)
/* Playback, as an application sees it. */
#define TARN_CATEGORY_PLAYBACK UINT32_C(4)
/* The output side of a device or a stream. */
#define TARN_CATEGORY_OUTPUT UINT32_C(5)
/* Both at once. */
#define TARN_CATEGORY_PLAYBACK_AND_RECORD UINT32_C(6)
/* The cycle of input and output; its Error is an overload. */
#define TARN_CATEGORY_IO UINT32_C(7)
/* Settings and set-up. Markers and device settings of a session are of this category. */
#define TARN_CATEGORY_SETUP UINT32_C(8)
/* What a program asked for. */
#define TARN_CATEGORY_CLIENT_REQUEST UINT32_C(9)
/* Another device or port plays or records. */
#define TARN_CATEGORY_ROUTE_CHANGE UINT32_C(10)
/* Something went wrong. A message of this category is never redundant. */
#define TARN_CATEGORY_ERROR UINT32_C(11)
/* What drivers count; derived at the session's stop. */
#define TARN_CATEGORY_FLUME UINT32_C(12)
/* Load, overloads, late callbacks. */
#define TARN_CATEGORY_PERFORMANCE UINT32_C(13)
/* Volume; its Summary is derived. */
#define TARN_CATEGORY_VOLUME UINT32_C(14)
/* Playback shared in a group; its Summary is derived. */
#define TARN_CATEGORY_LAGOON UINT32_C(15)
/* Exposure to sound. */
#define TARN_CATEGORY_HEARING_HEALTH UINT32_C(16)
/* Registration of accessories. */
#define TARN_CATEGORY_TESSELS UINT32_C(17)
/* What a text that is no category's name parses to. */
#define TARN_CATEGORY_UNKNOWN UINT32_C(4294967295)

/* Domains of a category. */

/* MIDI. */
#define TARN_DOMAIN_MIDI UINT32_C(0x04000000)
/* The session itself; its Generic Summary is derived. */
#define TARN_DOMAIN_SESSION UINT32_C(0x08000000)
/* Signal processing. */
#define TARN_DOMAIN_DSP UINT32_C(0x10000000)
/* The hardware layer. */
#define TARN_DOMAIN_HAL UINT32_C(0x20000000)
/* Routing. */
#define TARN_DOMAIN_ROUTING UINT32_C(0x40000000)
/* The tool box. */
#define TARN_DOMAIN_TOOLBOX UINT32_C(0x80000000)

/* Types. */

/* What fits nowhere else; also what an unknown name parses to. */
#define TARN_TYPE_GENERIC UINT16_C(0)
/* It begins. */
#define TARN_TYPE_START UINT16_C(1)
/* It ends. */
#define TARN_TYPE_STOP UINT16_C(2)
/* It becomes active. */
#define TARN_TYPE_ACTIVATE UINT16_C(3)
/* It becomes inactive. */
#define TARN_TYPE_DEACTIVATE UINT16_C(4)
/* Settings. */
#define TARN_TYPE_SETUP UINT16_C(5)
/* Something went wrong. A message of this type is never redundant. */
#define TARN_TYPE_ERROR UINT16_C(6)
/* A fault that somebody heard or measured: one metric record each. */
#define TARN_TYPE_ISSUE_DETECTOR UINT16_C(7)
/* Facts about power: up to three power-log events each. */
#define TARN_TYPE_WATTLOG UINT16_C(8)
/* Which audio units are used. */
#define TARN_TYPE_AUDIO_UNIT_USAGE UINT16_C(9)
/* A MIDI driver. */
#define TARN_TYPE_MIDI_DRIVER UINT16_C(10)
/* What a stretch of time comes to. */
#define TARN_TYPE_SUMMARY UINT16_C(11)
/* Exposure through headphones. */
#define TARN_TYPE_HEADPHONE_AUDIO_EXPOSURE UINT16_C(12)
/* Exposure to sound around. */
#define TARN_TYPE_AUDIO_EXPOSURE UINT16_C(13)
/* Enhancement of listening; the e inside is lower case. */
#define TARN_TYPE_LISTENING_ENHANCEMENT UINT16_C(14)
/* Carried as it is; no worker looks for it. */
#define TARN_TYPE_FENNEL UINT16_C(15)
/* Counters. */
#define TARN_TYPE_SIMPLE UINT16_C(16)
/* Histograms. */
#define TARN_TYPE_HISTOGRAM UINT16_C(17)
/* How long states lasted. */
#define TARN_TYPE_STATE UINT16_C(18)
/* Asks for the memory log. */
#define TARN_TYPE_MEMORY_LOG UINT16_C(19)
/* No type. */
#define TARN_TYPE_UNKNOWN UINT16_C(65535)

/* Service types. */

/* Anything. */
#define TARN_SERVICE_GENERIC UINT16_C(0)
/* A voice assistant. */
#define TARN_SERVICE_WISP UINT16_C(1)
/* A call. */
#define TARN_SERVICE_TELEPHONY UINT16_C(2)
/* Haptics. */
#define TARN_SERVICE_HAPTICS UINT16_C(3)
/* An alarm. Only here, and in tests, quiet alarms are looked for. */
#define TARN_SERVICE_ALARMS UINT16_C(4)
/* A program on its own. */
#define TARN_SERVICE_STANDALONE UINT16_C(5)
/* Sound that configures itself. */
#define TARN_SERVICE_SOUND_AUTO_CONFIG UINT16_C(6)
/* Music, films, podcasts. */
#define TARN_SERVICE_LONG_FORM_AUDIO UINT16_C(7)
/* Short sounds of an application. */
#define TARN_SERVICE_NON_LONG_FORM_AUDIO UINT16_C(8)
/* How devices are used. */
#define TARN_SERVICE_AUDIO_DEVICE_USAGE UINT16_C(9)
/* Alerts. */
#define TARN_SERVICE_ALERTS UINT16_C(10)
/* A test. It leaves a summary file and is not mirrored; on internal builds it may be traced. */
#define TARN_SERVICE_TEST UINT16_C(11)
/* How interfaces are used. Its events are mirrored at once, not gathered. */
#define TARN_SERVICE_API_USAGE UINT16_C(12)
/* Sounds of the system. */
#define TARN_SERVICE_SYSTEM_SOUNDS UINT16_C(13)
/* No service type yet: what a session has before one is set. */
#define TARN_SERVICE_UNKNOWN UINT16_C(65535)

/* Every message. */

/* When it happened. A missing one, or one that is more than a year old, is replaced by the time of arrival. (number,
 * s since 1970, 0 to 100000000000) */
#define TARN_KEY_TARNREPORTING_TIMESTAMP "tarnreporting_timestamp"
/* The application that this is about. A message without it gets that of the session's configuration, and Unknown
 * without one. (text) */
#define TARN_KEY_HOST_APPLICATION_DISPLAY_ID "HostApplicationDisplayID"
/* Counts as HostApplicationDisplayID where the same dictionary doesn't have that. (text) */
#define TARN_KEY_KV_HOST_APPLICATION_DISPLAY_ID "KvHostApplicationDisplayID"
/* The stamp that was replaced, or nil where there was none. (any) */
#define TARN_KEY_INVALID_TIMESTAMP "invalid_timestamp"
/* Category and type, joined: PlaybackStart. (text) */
#define TARN_KEY_AUDIOTAG "audiotag"
/* How long the device was up. Messages that differ in nothing else count as repeated. (number, s, 0 to 10000000000) */
#define TARN_KEY_SYSTEMUPTIME_SEC "systemuptime_sec"
/* Processor time that the process has used. Messages that differ in nothing else count as repeated. (number, ms, 0
 * to 10000000000000) */
#define TARN_KEY_PROCESSUPTIME_MS "processuptime_ms"
/* True: it came without reporter IDs (internal builds). (boolean) */
#define TARN_KEY_SEND_SINGLE_MESSAGE "sendSingleMessage"
/* Whether the session ran when the message came, in the summary file. (text) */
#define TARN_KEY_IS_SESSION_STARTED "isSessionStarted"

/* Output, volume and route. */

/* Output runs from this message on, or doesn't. (boolean) */
#define TARN_KEY_SESSION_OUTPUT_RUNNING "session_output_running"
/* The session's volume. (number, scalar, 0 to 1) */
#define TARN_KEY_KV_SESSION_VOLUME "KvSessionVolume"
/* The format that was chosen. (text) */
#define TARN_KEY_SESSION_SELECTED_FORMAT "session_selected_format"
/* The devices that play or record. (text) */
#define TARN_KEY_ACTIVE_DEVICES "active_devices"
/* The identifier of the format, a text or a number. (any) */
#define TARN_KEY_M_FORMAT_ID "mFormatID"
/* Channels of a frame. (integer, channels, 0 to 1024) */
#define TARN_KEY_M_CHANNELS_PER_FRAME "mChannelsPerFrame"
/* Sound is placed in space. (boolean) */
#define TARN_KEY_SPATIALIZATION_ENABLED "spatializationEnabled"
/* The device's setting for spatial sound with accessories; the service sends it too, as the setting is stored.
 * (boolean) */
#define TARN_KEY_SPATIAL_AUDIO_ACCESSORY_FEATURE "spatial-audio-accessory-feature"
/* The ringer switch; the service sends it too. (boolean) */
#define TARN_KEY_RINGERSTATE "ringerstate"
/* The client's session is over and was active so long. (number, s, 0 to 100000000) */
#define TARN_KEY_SESSION_DURATION "session_duration"
/* 1: inside a group session. (integer, 0 to 1) */
#define TARN_KEY_LAGOON_SESSION "lagoon_session"

/* Input. */

/* Input runs from this message on, or doesn't. (boolean) */
#define TARN_KEY_SESSION_INPUT_RUNNING "session_input_running"
/* The voice codec. (text) */
#define TARN_KEY_VP_CONFIG_PRIMARY_VOCODER "vp_config_primary_vocoder"
/* The codec's sampling rate as a text, 16000.0; one that begins with 0. is no rate. (text, Hz) */
#define TARN_KEY_VP_CONFIG_PRIMARY_VOCODER_FS "vp_config_primary_vocoderFs"
/* How voice processing works. (any) */
#define TARN_KEY_VP_CONFIG_OPERATION_MODE "vp_config_operation_mode"
/* The port that voice processing records from. (any) */
#define TARN_KEY_VP_CONFIG_INPUT_PORT "vp_config_input_port"

/* Streams that adapters report. */

/* The number of the stream's run, from 1: no two runs have equal messages. (integer) */
#define TARN_KEY_STREAM_RUN "stream_run"
/* Said before, to a service that wasn't there any more: how the stream was all the time. (boolean) */
#define TARN_KEY_RESTATED "restated"
/* Why the stream is over. (text) */
#define TARN_KEY_END_REASON "end_reason"
/* The factor of the amplitude: the cube of where a mixer's slider stands. (number) */
#define TARN_KEY_VOLUME_LINEAR "volume_linear"
/* The stream is muted. (boolean) */
#define TARN_KEY_MUTED "muted"
/* The factors of the channels, with commas. (text) */
#define TARN_KEY_CHANNEL_VOLUMES "channel_volumes"
/* Where the slider of the sink or source stands. (number, scalar, 0 to 1) */
#define TARN_KEY_DEVICE_VOLUME "device_volume"
/* The sink or source is muted. (boolean) */
#define TARN_KEY_DEVICE_MUTED "device_muted"
/* How the devices are connected, with commas. (text) */
#define TARN_KEY_DEVICE_BUS "device_bus"
/* What is used of the devices, as analog-output-headphones. (text) */
#define TARN_KEY_DEVICE_PORT "device_port"
/* The kinds of these ports, as headphones. (text) */
#define TARN_KEY_DEVICE_PORT_TYPE "device_port_type"
/* What the devices look like, as headset. (text) */
#define TARN_KEY_DEVICE_FORM_FACTOR "device_form_factor"
/* How the devices are used, as a2dp-sink. (text) */
#define TARN_KEY_DEVICE_PROFILE "device_profile"
/* The codec of a Bluetooth device. (text) */
#define TARN_KEY_BLUETOOTH_CODEC "bluetooth_codec"
/* The first device is the one that the user chose. (boolean) */
#define TARN_KEY_DEVICE_IS_DEFAULT "device_is_default"
/* How many devices one stream plays to. (integer) */
#define TARN_KEY_DEVICE_COUNT "device_count"
/* The rate of the stream's own format. (integer, Hz) */
#define TARN_KEY_SAMPLE_RATE "sample_rate"
/* The cycle in which sound is passed on; ALSA's period. (integer, frames) */
#define TARN_KEY_GRAPH_QUANTUM "graph_quantum"
/* The rate of the cycle. (integer, Hz) */
#define TARN_KEY_GRAPH_RATE "graph_rate"
/* What the stream asks for; ALSA's buffer. (integer, frames) */
#define TARN_KEY_STREAM_LATENCY_FRAMES "stream_latency_frames"
/* Cycles that were missed in a row. (integer) */
#define TARN_KEY_OVERLOAD_CYCLES "overload_cycles"
/* How long the overload lasted. (number, s) */
#define TARN_KEY_OVERLOAD_SECONDS "overload_seconds"
/* What the system of audio says of an error. (text) */
#define TARN_KEY_ERROR_TEXT "error_text"
/* Stream/Output/Audio or Stream/Input/Audio. (text) */
#define TARN_KEY_MEDIA_CLASS "media_class"
/* What the stream is for, as its program says: Music, Game. (text) */
#define TARN_KEY_MEDIA_ROLE "media_role"
/* The stream's name in PipeWire; the sub-device of ALSA. (text) */
#define TARN_KEY_STREAM_NODE "stream_node"
/* The file that the stream's process runs, without its folder. (text) */
#define TARN_KEY_APPLICATION_PROCESS_BINARY "application_process_binary"
/* The number of the stream's process. (integer) */
#define TARN_KEY_APPLICATION_PROCESS_ID "application_process_id"
/* The name of a sandboxed application. (text) */
#define TARN_KEY_PORTAL_APP_ID "portal_app_id"
/* The latency that the stream asks for, as 1024/48000. (text) */
#define TARN_KEY_REQUESTED_LATENCY "requested_latency"
/* The title; only where the configuration asks for it. (text) */
#define TARN_KEY_MEDIA_NAME "media_name"

/* Faults. */

/* What is wrong. (text) */
#define TARN_KEY_ISSUE_TYPE "issue_type"
/* Where it is wrong. (any) */
#define TARN_KEY_NODE "node"
/* Which client of real-time audio it concerns. (any) */
#define TARN_KEY_RTAID_CLIENT "rtaid_client"
/* How long a channel was silent. (number, s, 0 to 2147483647) */
#define TARN_KEY_ANY_CHANNEL_SILENCE_SECONDS "any_channel_silence_seconds"
/* The smallest buffer at an overload. (integer, frames, 0 to 2147483647) */
#define TARN_KEY_SMALLEST_BUFFER_FRAME_SIZE "smallest_buffer_frame_size"
/* The cycle of an overload. (integer, cycles, 0 to 2147483647) */
#define TARN_KEY_IO_CYCLE "io_cycle"
/* A call got coordinates that can't be. (any) */
#define TARN_KEY_PREFIX_PLAC_INVALID "plac_invalid_"

/* Power. */

/* How long the haptics engine was on. (number, s, 0 to 100000000) */
#define TARN_KEY_ENGINE_ON_TIME "EngineOnTime"
/* EngineOn, or anything else for off. (text) */
#define TARN_KEY_ENGINE_STATE "EngineState"
/* A haptics session holds the hardware so long already. (number, s, 0 to 100000000) */
#define TARN_KEY_HAPTIC_ACTIVE_HARDWARE_TIME_SECONDS "Haptic_Active_Hardware_Time_Seconds"
/* Who holds it. (any) */
#define TARN_KEY_ACTIVE_CLIENTS "Active_Clients"
/* A system sound doesn't end for so long. (number, s, 0 to 100000000) */
#define TARN_KEY_SYSTEM_SOUND_STUCK_TIME_SECONDS "System_Sound_Stuck_Time_Seconds"

/* Markers of a session's start and stop. */

/* What was called. (text) */
#define TARN_KEY_METHOD "method"
/* Records in the session's log before the marker. (integer, messages) */
#define TARN_KEY_MESSAGES_AT_START "messages_at_start"
/* The same number as messages_at_start: the log holds no repeated messages. (integer, messages) */
#define TARN_KEY_UNIQUE_MESSAGES_AT_START "unique_messages_at_start"
/* Whether the session ran before the call. (text) */
#define TARN_KEY_RUNNING_AT_START "running_at_start"
/* Records in the session's log before the marker. (integer, messages) */
#define TARN_KEY_MESSAGES_AT_STOP "messages_at_stop"
/* The same number as messages_at_stop: the log holds no repeated messages. (integer, messages) */
#define TARN_KEY_UNIQUE_MESSAGES_AT_STOP "unique_messages_at_stop"
/* Whether the session ran before the call. (text) */
#define TARN_KEY_RUNNING_AT_STOP "running_at_stop"
/* The session's reporter ID. (integer) */
#define TARN_KEY_REPORTERID "reporterid"

/* Summary of a session. */

/* The sum of session_duration. (number, s) */
#define TARN_KEY_TOTAL_ACTIVE_TIME "total_active_time"
/* Messages with session_duration. (integer, messages) */
#define TARN_KEY_ACTIVE_COUNT "active_count"
/* Messages without it whose issue_type is overload. (integer, messages) */
#define TARN_KEY_OVERLOAD_COUNT "overload_count"
/* total_active_time over active_count, 0 without any. (number, s) */
#define TARN_KEY_AVERAGE_ACTIVE_TIME "average_active_time"
/* Messages since the last stop, repeated and derived ones included. (integer, messages) */
#define TARN_KEY_NUM_MESSAGES "num_messages"
/* Records in the log, the markers included. (integer, messages) */
#define TARN_KEY_NUM_UNIQUE_MESSAGES "num_unique_messages"
/* num_messages less num_unique_messages, as it comes out. (integer, messages) */
#define TARN_KEY_NUM_REDUNDANT_MESSAGES "num_redundant_messages"
/* Whether it is the service's session for messages without one. (boolean) */
#define TARN_KEY_SINGLE_MESSAGE_SESSION "singleMessageSession"
/* The name of the session's service type. (text) */
#define TARN_KEY_SUMMARY_SERVICE_NAME "summaryServiceName"
/* The name of the client's process, when it is known. (text) */
#define TARN_KEY_CLIENT_PROCESS_NAME "clientProcessName"
/* The device's thermal state. (text) */
#define TARN_KEY_THERMAL_STATE "thermal_state"
/* Whether the device saves power. (boolean) */
#define TARN_KEY_LOW_POWER_ENABLED "low_power_enabled"
/* Memory of the service, when it is known. (integer, MiB) */
#define TARN_KEY_VM_INFO_PHYS_FOOTPRINT_MIB "vmInfo_phys_footprint_MiB"
/* The system's load average. (number) */
#define TARN_KEY_LOAD_AVG_1_MIN "load_avg_1_min"
/* The system's load average. (number) */
#define TARN_KEY_LOAD_AVG_5_MIN "load_avg_5_min"
/* The system's load average. (number) */
#define TARN_KEY_LOAD_AVG_15_MIN "load_avg_15_min"

/* Summaries of segments. */

/* How long the segment was, in single precision. (number, s) */
#define TARN_KEY_PLAY_SECONDS "play_seconds"
/* The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000. (text, s) */
#define TARN_KEY_PLAY_SECONDS_BUCKETED "play_secondsBucketed"
/* The nearest sixteenth, with at least one decimal: 0.5. (text, scalar) */
#define TARN_KEY_KV_SESSION_VOLUME_BUCKETED "KvSessionVolumeBucketed"
/* How long the segment was, in single precision. (number, s) */
#define TARN_KEY_INPUTRUNNING_SECONDS "inputrunning_seconds"
/* The nearest of 0, 1, 5, 10, 30, 60, 300, 1800, 3600, 7200, 18000. (text, s) */
#define TARN_KEY_INPUTRUNNING_SECONDS_BUCKETED "inputrunning_secondsBucketed"
/* Codecs with their rates, CODEC:RATE, sorted, with commas; only when there are any. (text) */
#define TARN_KEY_VOCODERS "vocoders"
/* The message's place among those of its kind that this stop derived, from 1. (integer) */
#define TARN_KEY_MSGIDX "msgidx"
/* How many messages of its kind this stop derived. (integer) */
#define TARN_KEY_MSGCNT "msgcnt"

/* Settings of the device. */

/* The device's name, as the setting is stored. (any) */
#define TARN_KEY_DEVICE_NAME "device_name"
/* When the service last read the setting. (number, s since 1970) */
#define TARN_KEY_LAST_UPDATED "last_updated"

/* Traced test sessions. */

/* A property-list file that describes the probes; a session without it isn't traced. (text) */
#define TARN_KEY_TARN_REPORTING_SKEIN_PLIST_FILE_PATH "TarnReportingSkeinPlistFilePath"
/* sktrace_profile: trace template 3; anything else is template 2. (text) */
#define TARN_KEY_TARN_REPORTING_TRACE_TYPE "TarnReportingTraceType"
/* The name of the perf-data file. (text) */
#define TARN_KEY_TARN_REPORTING_SKEIN_OUTPUT_FILE_NAME "TarnReportingSkeinOutputFileName"
/* Its directory, an absolute path. (text) */
#define TARN_KEY_TARN_REPORTING_SKEIN_OUTPUT_FILE_DIRECTORY "TarnReportingSkeinOutputFileDirectory"

/* clang-format on */
