/* What can be said: numbers and keys of messages. docs/messages.md tells what they mean.
 *
 * Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this. */
#pragma once

#include <stdint.h>

/* clang-format off */

/* Categories. A domain may be added: TARN_DOMAIN_DSP | TARN_CATEGORY_PLAYBACK. */
#define TARN_CATEGORY_UNDEFINED UINT32_C(0)
#define TARN_CATEGORY_GENERIC UINT32_C(1)
#define TARN_CATEGORY_RECORD UINT32_C(2)
#define TARN_CATEGORY_INPUT UINT32_C(3)
#define TARN_CATEGORY_PLAYBACK UINT32_C(4)
#define TARN_CATEGORY_OUTPUT UINT32_C(5)
#define TARN_CATEGORY_PLAYBACK_AND_RECORD UINT32_C(6)
#define TARN_CATEGORY_IO UINT32_C(7)
#define TARN_CATEGORY_SETUP UINT32_C(8)
#define TARN_CATEGORY_CLIENT_REQUEST UINT32_C(9)
#define TARN_CATEGORY_ROUTE_CHANGE UINT32_C(10)
#define TARN_CATEGORY_ERROR UINT32_C(11)
#define TARN_CATEGORY_FLUME UINT32_C(12)
#define TARN_CATEGORY_PERFORMANCE UINT32_C(13)
#define TARN_CATEGORY_VOLUME UINT32_C(14)
#define TARN_CATEGORY_LAGOON UINT32_C(15)
#define TARN_CATEGORY_HEARING_HEALTH UINT32_C(16)
#define TARN_CATEGORY_TESSELS UINT32_C(17)
#define TARN_CATEGORY_UNKNOWN UINT32_C(4294967295)

/* Domains of a category. */
#define TARN_DOMAIN_MIDI UINT32_C(0x04000000)
#define TARN_DOMAIN_SESSION UINT32_C(0x08000000)
#define TARN_DOMAIN_DSP UINT32_C(0x10000000)
#define TARN_DOMAIN_HAL UINT32_C(0x20000000)
#define TARN_DOMAIN_ROUTING UINT32_C(0x40000000)
#define TARN_DOMAIN_TOOLBOX UINT32_C(0x80000000)

/* Types. */
#define TARN_TYPE_GENERIC UINT16_C(0)
#define TARN_TYPE_START UINT16_C(1)
#define TARN_TYPE_STOP UINT16_C(2)
#define TARN_TYPE_ACTIVATE UINT16_C(3)
#define TARN_TYPE_DEACTIVATE UINT16_C(4)
#define TARN_TYPE_SETUP UINT16_C(5)
#define TARN_TYPE_ERROR UINT16_C(6)
#define TARN_TYPE_ISSUE_DETECTOR UINT16_C(7)
#define TARN_TYPE_WATTLOG UINT16_C(8)
#define TARN_TYPE_AUDIO_UNIT_USAGE UINT16_C(9)
#define TARN_TYPE_MIDI_DRIVER UINT16_C(10)
#define TARN_TYPE_SUMMARY UINT16_C(11)
#define TARN_TYPE_HEADPHONE_AUDIO_EXPOSURE UINT16_C(12)
#define TARN_TYPE_AUDIO_EXPOSURE UINT16_C(13)
#define TARN_TYPE_LISTENING_ENHANCEMENT UINT16_C(14)
#define TARN_TYPE_FENNEL UINT16_C(15)
#define TARN_TYPE_SIMPLE UINT16_C(16)
#define TARN_TYPE_HISTOGRAM UINT16_C(17)
#define TARN_TYPE_STATE UINT16_C(18)
#define TARN_TYPE_MEMORY_LOG UINT16_C(19)
#define TARN_TYPE_UNKNOWN UINT16_C(65535)

/* Service types. */
#define TARN_SERVICE_GENERIC UINT16_C(0)
#define TARN_SERVICE_WISP UINT16_C(1)
#define TARN_SERVICE_TELEPHONY UINT16_C(2)
#define TARN_SERVICE_HAPTICS UINT16_C(3)
#define TARN_SERVICE_ALARMS UINT16_C(4)
#define TARN_SERVICE_STANDALONE UINT16_C(5)
#define TARN_SERVICE_SOUND_AUTO_CONFIG UINT16_C(6)
#define TARN_SERVICE_LONG_FORM_AUDIO UINT16_C(7)
#define TARN_SERVICE_NON_LONG_FORM_AUDIO UINT16_C(8)
#define TARN_SERVICE_AUDIO_DEVICE_USAGE UINT16_C(9)
#define TARN_SERVICE_ALERTS UINT16_C(10)
#define TARN_SERVICE_TEST UINT16_C(11)
#define TARN_SERVICE_API_USAGE UINT16_C(12)
#define TARN_SERVICE_SYSTEM_SOUNDS UINT16_C(13)
#define TARN_SERVICE_UNKNOWN UINT16_C(65535)

/* Every message. */
#define TARN_KEY_TARNREPORTING_TIMESTAMP "tarnreporting_timestamp" /* number, s since 1970, 0 to 100000000000 */
#define TARN_KEY_HOST_APPLICATION_DISPLAY_ID "HostApplicationDisplayID" /* text */
#define TARN_KEY_KV_HOST_APPLICATION_DISPLAY_ID "KvHostApplicationDisplayID" /* text */
#define TARN_KEY_INVALID_TIMESTAMP "invalid_timestamp" /* any */
#define TARN_KEY_AUDIOTAG "audiotag" /* text */
#define TARN_KEY_SYSTEMUPTIME_SEC "systemuptime_sec" /* number, s, 0 to 10000000000 */
#define TARN_KEY_PROCESSUPTIME_MS "processuptime_ms" /* number, ms, 0 to 10000000000000 */
#define TARN_KEY_SEND_SINGLE_MESSAGE "sendSingleMessage" /* boolean */
#define TARN_KEY_IS_SESSION_STARTED "isSessionStarted" /* text */

/* Output, volume and route. */
#define TARN_KEY_SESSION_OUTPUT_RUNNING "session_output_running" /* boolean */
#define TARN_KEY_KV_SESSION_VOLUME "KvSessionVolume" /* number, scalar, 0 to 1 */
#define TARN_KEY_SESSION_SELECTED_FORMAT "session_selected_format" /* text */
#define TARN_KEY_ACTIVE_DEVICES "active_devices" /* text */
#define TARN_KEY_M_FORMAT_ID "mFormatID" /* any */
#define TARN_KEY_M_CHANNELS_PER_FRAME "mChannelsPerFrame" /* integer, channels, 0 to 1024 */
#define TARN_KEY_SPATIALIZATION_ENABLED "spatializationEnabled" /* boolean */
#define TARN_KEY_SPATIAL_AUDIO_ACCESSORY_FEATURE "spatial-audio-accessory-feature" /* boolean */
#define TARN_KEY_RINGERSTATE "ringerstate" /* boolean */
#define TARN_KEY_SESSION_DURATION "session_duration" /* number, s, 0 to 100000000 */
#define TARN_KEY_LAGOON_SESSION "lagoon_session" /* integer, 0 to 1 */

/* Input. */
#define TARN_KEY_SESSION_INPUT_RUNNING "session_input_running" /* boolean */
#define TARN_KEY_VP_CONFIG_PRIMARY_VOCODER "vp_config_primary_vocoder" /* text */
#define TARN_KEY_VP_CONFIG_PRIMARY_VOCODER_FS "vp_config_primary_vocoderFs" /* text, Hz */
#define TARN_KEY_VP_CONFIG_OPERATION_MODE "vp_config_operation_mode" /* any */
#define TARN_KEY_VP_CONFIG_INPUT_PORT "vp_config_input_port" /* any */

/* Faults. */
#define TARN_KEY_ISSUE_TYPE "issue_type" /* text */
#define TARN_KEY_NODE "node" /* any */
#define TARN_KEY_RTAID_CLIENT "rtaid_client" /* any */
#define TARN_KEY_ANY_CHANNEL_SILENCE_SECONDS "any_channel_silence_seconds" /* number, s, 0 to 2147483647 */
#define TARN_KEY_SMALLEST_BUFFER_FRAME_SIZE "smallest_buffer_frame_size" /* integer, frames, 0 to 2147483647 */
#define TARN_KEY_IO_CYCLE "io_cycle" /* integer, cycles, 0 to 2147483647 */
#define TARN_KEY_PREFIX_PLAC_INVALID "plac_invalid_" /* any */

/* Power. */
#define TARN_KEY_ENGINE_ON_TIME "EngineOnTime" /* number, s, 0 to 100000000 */
#define TARN_KEY_ENGINE_STATE "EngineState" /* text */
#define TARN_KEY_HAPTIC_ACTIVE_HARDWARE_TIME_SECONDS "Haptic_Active_Hardware_Time_Seconds" /* number, s, 0 to 100000000 */
#define TARN_KEY_ACTIVE_CLIENTS "Active_Clients" /* any */
#define TARN_KEY_SYSTEM_SOUND_STUCK_TIME_SECONDS "System_Sound_Stuck_Time_Seconds" /* number, s, 0 to 100000000 */

/* Markers of a session's start and stop. */
#define TARN_KEY_METHOD "method" /* text */
#define TARN_KEY_MESSAGES_AT_START "messages_at_start" /* integer, messages */
#define TARN_KEY_UNIQUE_MESSAGES_AT_START "unique_messages_at_start" /* integer, messages */
#define TARN_KEY_RUNNING_AT_START "running_at_start" /* text */
#define TARN_KEY_MESSAGES_AT_STOP "messages_at_stop" /* integer, messages */
#define TARN_KEY_UNIQUE_MESSAGES_AT_STOP "unique_messages_at_stop" /* integer, messages */
#define TARN_KEY_RUNNING_AT_STOP "running_at_stop" /* text */
#define TARN_KEY_REPORTERID "reporterid" /* integer */

/* Summary of a session. */
#define TARN_KEY_TOTAL_ACTIVE_TIME "total_active_time" /* number, s */
#define TARN_KEY_ACTIVE_COUNT "active_count" /* integer, messages */
#define TARN_KEY_OVERLOAD_COUNT "overload_count" /* integer, messages */
#define TARN_KEY_AVERAGE_ACTIVE_TIME "average_active_time" /* number, s */
#define TARN_KEY_NUM_MESSAGES "num_messages" /* integer, messages */
#define TARN_KEY_NUM_UNIQUE_MESSAGES "num_unique_messages" /* integer, messages */
#define TARN_KEY_NUM_REDUNDANT_MESSAGES "num_redundant_messages" /* integer, messages */
#define TARN_KEY_SINGLE_MESSAGE_SESSION "singleMessageSession" /* boolean */
#define TARN_KEY_SUMMARY_SERVICE_NAME "summaryServiceName" /* text */
#define TARN_KEY_CLIENT_PROCESS_NAME "clientProcessName" /* text */
#define TARN_KEY_THERMAL_STATE "thermal_state" /* text */
#define TARN_KEY_LOW_POWER_ENABLED "low_power_enabled" /* boolean */
#define TARN_KEY_VM_INFO_PHYS_FOOTPRINT_MIB "vmInfo_phys_footprint_MiB" /* integer, MiB */
#define TARN_KEY_LOAD_AVG_1_MIN "load_avg_1_min" /* number */
#define TARN_KEY_LOAD_AVG_5_MIN "load_avg_5_min" /* number */
#define TARN_KEY_LOAD_AVG_15_MIN "load_avg_15_min" /* number */

/* Summaries of segments. */
#define TARN_KEY_PLAY_SECONDS "play_seconds" /* number, s */
#define TARN_KEY_PLAY_SECONDS_BUCKETED "play_secondsBucketed" /* text, s */
#define TARN_KEY_KV_SESSION_VOLUME_BUCKETED "KvSessionVolumeBucketed" /* text, scalar */
#define TARN_KEY_INPUTRUNNING_SECONDS "inputrunning_seconds" /* number, s */
#define TARN_KEY_INPUTRUNNING_SECONDS_BUCKETED "inputrunning_secondsBucketed" /* text, s */
#define TARN_KEY_VOCODERS "vocoders" /* text */
#define TARN_KEY_MSGIDX "msgidx" /* integer */
#define TARN_KEY_MSGCNT "msgcnt" /* integer */

/* Settings of the device. */
#define TARN_KEY_DEVICE_NAME "device_name" /* any */
#define TARN_KEY_LAST_UPDATED "last_updated" /* number, s since 1970 */

/* Traced test sessions. */
#define TARN_KEY_TARN_REPORTING_SKEIN_PLIST_FILE_PATH "TarnReportingSkeinPlistFilePath" /* text */
#define TARN_KEY_TARN_REPORTING_TRACE_TYPE "TarnReportingTraceType" /* text */
#define TARN_KEY_TARN_REPORTING_SKEIN_OUTPUT_FILE_NAME "TarnReportingSkeinOutputFileName" /* text */
#define TARN_KEY_TARN_REPORTING_SKEIN_OUTPUT_FILE_DIRECTORY "TarnReportingSkeinOutputFileDirectory" /* text */

/* clang-format on */
