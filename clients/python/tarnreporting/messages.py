# SPDX-License-Identifier: Apache-2.0
"""What can be said: numbers and keys of messages. docs/messages.md tells what they mean.

Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this.
"""

from enum import IntEnum
from typing import Final


class Category(IntEnum):
    """What a message is about. A domain may be added: Domain.DSP | Category.PLAYBACK."""

    UNDEFINED = 0
    GENERIC = 1
    RECORD = 2
    INPUT = 3
    PLAYBACK = 4
    OUTPUT = 5
    PLAYBACK_AND_RECORD = 6
    IO = 7
    SETUP = 8
    CLIENT_REQUEST = 9
    ROUTE_CHANGE = 10
    ERROR = 11
    FLUME = 12
    PERFORMANCE = 13
    VOLUME = 14
    LAGOON = 15
    HEARING_HEALTH = 16
    TESSELS = 17
    UNKNOWN = 4294967295


class Domain(IntEnum):
    """The high half of a category."""

    MIDI = 0x04000000
    SESSION = 0x08000000
    DSP = 0x10000000
    HAL = 0x20000000
    ROUTING = 0x40000000
    TOOLBOX = 0x80000000


class Type(IntEnum):
    """What happened."""

    GENERIC = 0
    START = 1
    STOP = 2
    ACTIVATE = 3
    DEACTIVATE = 4
    SETUP = 5
    ERROR = 6
    ISSUE_DETECTOR = 7
    WATTLOG = 8
    AUDIO_UNIT_USAGE = 9
    MIDI_DRIVER = 10
    SUMMARY = 11
    HEADPHONE_AUDIO_EXPOSURE = 12
    AUDIO_EXPOSURE = 13
    LISTENING_ENHANCEMENT = 14
    FENNEL = 15
    SIMPLE = 16
    HISTOGRAM = 17
    STATE = 18
    MEMORY_LOG = 19
    UNKNOWN = 65535


class ServiceType(IntEnum):
    """What a session is for."""

    GENERIC = 0
    WISP = 1
    TELEPHONY = 2
    HAPTICS = 3
    ALARMS = 4
    STANDALONE = 5
    SOUND_AUTO_CONFIG = 6
    LONG_FORM_AUDIO = 7
    NON_LONG_FORM_AUDIO = 8
    AUDIO_DEVICE_USAGE = 9
    ALERTS = 10
    TEST = 11
    API_USAGE = 12
    SYSTEM_SOUNDS = 13
    UNKNOWN = 65535


class Key:
    """The keys of messages and of configurations; after each its kind, unit and range."""

    # Every message.
    TARNREPORTING_TIMESTAMP: Final[str] = "tarnreporting_timestamp"  # number, s since 1970, 0 to 100000000000
    HOST_APPLICATION_DISPLAY_ID: Final[str] = "HostApplicationDisplayID"  # text
    KV_HOST_APPLICATION_DISPLAY_ID: Final[str] = "KvHostApplicationDisplayID"  # text
    INVALID_TIMESTAMP: Final[str] = "invalid_timestamp"  # any
    AUDIOTAG: Final[str] = "audiotag"  # text
    SYSTEMUPTIME_SEC: Final[str] = "systemuptime_sec"  # number, s, 0 to 10000000000
    PROCESSUPTIME_MS: Final[str] = "processuptime_ms"  # number, ms, 0 to 10000000000000
    SEND_SINGLE_MESSAGE: Final[str] = "sendSingleMessage"  # boolean
    IS_SESSION_STARTED: Final[str] = "isSessionStarted"  # text

    # Output, volume and route.
    SESSION_OUTPUT_RUNNING: Final[str] = "session_output_running"  # boolean
    KV_SESSION_VOLUME: Final[str] = "KvSessionVolume"  # number, scalar, 0 to 1
    SESSION_SELECTED_FORMAT: Final[str] = "session_selected_format"  # text
    ACTIVE_DEVICES: Final[str] = "active_devices"  # text
    M_FORMAT_ID: Final[str] = "mFormatID"  # any
    M_CHANNELS_PER_FRAME: Final[str] = "mChannelsPerFrame"  # integer, channels, 0 to 1024
    SPATIALIZATION_ENABLED: Final[str] = "spatializationEnabled"  # boolean
    SPATIAL_AUDIO_ACCESSORY_FEATURE: Final[str] = "spatial-audio-accessory-feature"  # boolean
    RINGERSTATE: Final[str] = "ringerstate"  # boolean
    SESSION_DURATION: Final[str] = "session_duration"  # number, s, 0 to 100000000
    LAGOON_SESSION: Final[str] = "lagoon_session"  # integer, 0 to 1

    # Input.
    SESSION_INPUT_RUNNING: Final[str] = "session_input_running"  # boolean
    VP_CONFIG_PRIMARY_VOCODER: Final[str] = "vp_config_primary_vocoder"  # text
    VP_CONFIG_PRIMARY_VOCODER_FS: Final[str] = "vp_config_primary_vocoderFs"  # text, Hz
    VP_CONFIG_OPERATION_MODE: Final[str] = "vp_config_operation_mode"  # any
    VP_CONFIG_INPUT_PORT: Final[str] = "vp_config_input_port"  # any

    # Streams that adapters report.
    STREAM_RUN: Final[str] = "stream_run"  # integer
    RESTATED: Final[str] = "restated"  # boolean
    END_REASON: Final[str] = "end_reason"  # text
    VOLUME_LINEAR: Final[str] = "volume_linear"  # number
    MUTED: Final[str] = "muted"  # boolean
    CHANNEL_VOLUMES: Final[str] = "channel_volumes"  # text
    DEVICE_VOLUME: Final[str] = "device_volume"  # number, scalar, 0 to 1
    DEVICE_MUTED: Final[str] = "device_muted"  # boolean
    DEVICE_BUS: Final[str] = "device_bus"  # text
    DEVICE_PORT: Final[str] = "device_port"  # text
    DEVICE_PORT_TYPE: Final[str] = "device_port_type"  # text
    DEVICE_FORM_FACTOR: Final[str] = "device_form_factor"  # text
    DEVICE_PROFILE: Final[str] = "device_profile"  # text
    BLUETOOTH_CODEC: Final[str] = "bluetooth_codec"  # text
    DEVICE_IS_DEFAULT: Final[str] = "device_is_default"  # boolean
    DEVICE_COUNT: Final[str] = "device_count"  # integer
    SAMPLE_RATE: Final[str] = "sample_rate"  # integer, Hz
    GRAPH_QUANTUM: Final[str] = "graph_quantum"  # integer, frames
    GRAPH_RATE: Final[str] = "graph_rate"  # integer, Hz
    STREAM_LATENCY_FRAMES: Final[str] = "stream_latency_frames"  # integer, frames
    OVERLOAD_CYCLES: Final[str] = "overload_cycles"  # integer
    OVERLOAD_SECONDS: Final[str] = "overload_seconds"  # number, s
    ERROR_TEXT: Final[str] = "error_text"  # text
    MEDIA_CLASS: Final[str] = "media_class"  # text
    MEDIA_ROLE: Final[str] = "media_role"  # text
    STREAM_NODE: Final[str] = "stream_node"  # text
    APPLICATION_PROCESS_BINARY: Final[str] = "application_process_binary"  # text
    APPLICATION_PROCESS_ID: Final[str] = "application_process_id"  # integer
    PORTAL_APP_ID: Final[str] = "portal_app_id"  # text
    REQUESTED_LATENCY: Final[str] = "requested_latency"  # text
    MEDIA_NAME: Final[str] = "media_name"  # text

    # Faults.
    ISSUE_TYPE: Final[str] = "issue_type"  # text
    NODE: Final[str] = "node"  # any
    RTAID_CLIENT: Final[str] = "rtaid_client"  # any
    ANY_CHANNEL_SILENCE_SECONDS: Final[str] = "any_channel_silence_seconds"  # number, s, 0 to 2147483647
    SMALLEST_BUFFER_FRAME_SIZE: Final[str] = "smallest_buffer_frame_size"  # integer, frames, 0 to 2147483647
    IO_CYCLE: Final[str] = "io_cycle"  # integer, cycles, 0 to 2147483647
    PREFIX_PLAC_INVALID: Final[str] = "plac_invalid_"  # any

    # Power.
    ENGINE_ON_TIME: Final[str] = "EngineOnTime"  # number, s, 0 to 100000000
    ENGINE_STATE: Final[str] = "EngineState"  # text
    HAPTIC_ACTIVE_HARDWARE_TIME_SECONDS: Final[str] = "Haptic_Active_Hardware_Time_Seconds"  # number, s, 0 to 100000000
    ACTIVE_CLIENTS: Final[str] = "Active_Clients"  # any
    SYSTEM_SOUND_STUCK_TIME_SECONDS: Final[str] = "System_Sound_Stuck_Time_Seconds"  # number, s, 0 to 100000000

    # Markers of a session's start and stop.
    METHOD: Final[str] = "method"  # text
    MESSAGES_AT_START: Final[str] = "messages_at_start"  # integer, messages
    UNIQUE_MESSAGES_AT_START: Final[str] = "unique_messages_at_start"  # integer, messages
    RUNNING_AT_START: Final[str] = "running_at_start"  # text
    MESSAGES_AT_STOP: Final[str] = "messages_at_stop"  # integer, messages
    UNIQUE_MESSAGES_AT_STOP: Final[str] = "unique_messages_at_stop"  # integer, messages
    RUNNING_AT_STOP: Final[str] = "running_at_stop"  # text
    REPORTERID: Final[str] = "reporterid"  # integer

    # Summary of a session.
    TOTAL_ACTIVE_TIME: Final[str] = "total_active_time"  # number, s
    ACTIVE_COUNT: Final[str] = "active_count"  # integer, messages
    OVERLOAD_COUNT: Final[str] = "overload_count"  # integer, messages
    AVERAGE_ACTIVE_TIME: Final[str] = "average_active_time"  # number, s
    NUM_MESSAGES: Final[str] = "num_messages"  # integer, messages
    NUM_UNIQUE_MESSAGES: Final[str] = "num_unique_messages"  # integer, messages
    NUM_REDUNDANT_MESSAGES: Final[str] = "num_redundant_messages"  # integer, messages
    SINGLE_MESSAGE_SESSION: Final[str] = "singleMessageSession"  # boolean
    SUMMARY_SERVICE_NAME: Final[str] = "summaryServiceName"  # text
    CLIENT_PROCESS_NAME: Final[str] = "clientProcessName"  # text
    THERMAL_STATE: Final[str] = "thermal_state"  # text
    LOW_POWER_ENABLED: Final[str] = "low_power_enabled"  # boolean
    VM_INFO_PHYS_FOOTPRINT_MIB: Final[str] = "vmInfo_phys_footprint_MiB"  # integer, MiB
    LOAD_AVG_1_MIN: Final[str] = "load_avg_1_min"  # number
    LOAD_AVG_5_MIN: Final[str] = "load_avg_5_min"  # number
    LOAD_AVG_15_MIN: Final[str] = "load_avg_15_min"  # number

    # Summaries of segments.
    PLAY_SECONDS: Final[str] = "play_seconds"  # number, s
    PLAY_SECONDS_BUCKETED: Final[str] = "play_secondsBucketed"  # text, s
    KV_SESSION_VOLUME_BUCKETED: Final[str] = "KvSessionVolumeBucketed"  # text, scalar
    INPUTRUNNING_SECONDS: Final[str] = "inputrunning_seconds"  # number, s
    INPUTRUNNING_SECONDS_BUCKETED: Final[str] = "inputrunning_secondsBucketed"  # text, s
    VOCODERS: Final[str] = "vocoders"  # text
    MSGIDX: Final[str] = "msgidx"  # integer
    MSGCNT: Final[str] = "msgcnt"  # integer

    # Settings of the device.
    DEVICE_NAME: Final[str] = "device_name"  # any
    LAST_UPDATED: Final[str] = "last_updated"  # number, s since 1970

    # Traced test sessions.
    TARN_REPORTING_SKEIN_PLIST_FILE_PATH: Final[str] = "TarnReportingSkeinPlistFilePath"  # text
    TARN_REPORTING_TRACE_TYPE: Final[str] = "TarnReportingTraceType"  # text
    TARN_REPORTING_SKEIN_OUTPUT_FILE_NAME: Final[str] = "TarnReportingSkeinOutputFileName"  # text
    TARN_REPORTING_SKEIN_OUTPUT_FILE_DIRECTORY: Final[str] = "TarnReportingSkeinOutputFileDirectory"  # text
