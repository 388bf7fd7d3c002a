// SPDX-License-Identifier: Apache-2.0
#include "recorder/store/StoreViews.h"

#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

namespace tarn::recorder {

namespace {

// By the first of the two names that a message has in the analytics events; the rows of a kind are found from the kind.
constexpr const char* kOfName =
    " FROM event_texts AS k CROSS JOIN event_rows AS r ON r.id BETWEEN k.id >> 1 AND (k.id >> 1) + 255 AND r.kind = "
    "r.id - (k.id >> 1) CROSS JOIN event_texts AS p ON p.id = 2 * (r.id - r.payload) WHERE k.backend = 'tally' AND "
    "k.name = 'sys.oxbow.tarnkit.";

// A column, and the key that it shows.
using Columns = std::initializer_list<std::pair<const char*, const char*>>;

std::string keysOf(const char* payload, Columns columns) {
  std::string sql;
  for (const auto& [column, key] : columns) {
    sql.append(", ").append(payload).append(" ->> '$.\"").append(key).append("\"' AS ").append(column);
  }
  return sql;
}

std::string derivedView(const std::string& view, const char* message, Columns columns) {
  return "CREATE VIEW " + view + " AS SELECT r.id AS id, r.time AS time, r.session AS session" +
         keysOf("p.text", columns) + kOfName + message + "'";
}

constexpr Columns kMessageKeys = {
    {"audiotag", "audiotag"},
    {"application", "HostApplicationDisplayID"},
    {"happened", "tarnreporting_timestamp"},
    {"output_running", "session_output_running"},
    {"input_running", "session_input_running"},
    {"volume", "KvSessionVolume"},
    {"devices", "active_devices"},
    {"format", "session_selected_format"},
    {"duration", "session_duration"},
    {"issue_type", "issue_type"},
};

constexpr Columns kVolumeKeys = {
    {"application", "HostApplicationDisplayID"},
    {"play_seconds", "play_seconds"},
    {"volume", "KvSessionVolume"},
    {"devices", "active_devices"},
    {"format", "session_selected_format"},
    {"format_id", "mFormatID"},
    {"channels", "mChannelsPerFrame"},
    {"spatialization", "spatializationEnabled"},
    {"spatial_accessory", "spatial-audio-accessory-feature"},
    {"ringer", "ringerstate"},
    {"msgidx", "msgidx"},
    {"msgcnt", "msgcnt"},
};

constexpr Columns kInputKeys = {
    {"application", "HostApplicationDisplayID"},
    {"input_seconds", "inputrunning_seconds"},
    {"devices", "active_devices"},
    {"vocoders", "vocoders"},
    {"operation_mode", "vp_config_operation_mode"},
    {"input_port", "vp_config_input_port"},
    {"msgidx", "msgidx"},
    {"msgcnt", "msgcnt"},
};

constexpr Columns kGroupKeys = {
    {"application", "HostApplicationDisplayID"},
    {"play_seconds", "play_seconds"},
    {"devices", "active_devices"},
    {"format", "session_selected_format"},
    {"format_id", "mFormatID"},
    {"channels", "mChannelsPerFrame"},
    {"msgidx", "msgidx"},
    {"msgcnt", "msgcnt"},
};

constexpr Columns kSummaryKeys = {
    {"application", "HostApplicationDisplayID"},
    {"service_name", "summaryServiceName"},
    {"process", "clientProcessName"},
    {"total_active_time", "total_active_time"},
    {"active_count", "active_count"},
    {"average_active_time", "average_active_time"},
    {"overload_count", "overload_count"},
    {"num_messages", "num_messages"},
    {"num_unique_messages", "num_unique_messages"},
    {"num_redundant_messages", "num_redundant_messages"},
    {"single_message_session", "singleMessageSession"},
    {"thermal_state", "thermal_state"},
    {"low_power", "low_power_enabled"},
    {"footprint_mib", "vmInfo_phys_footprint_MiB"},
    {"load_1_min", "load_avg_1_min"},
};

// The rows of `events`, in whichever way is quick: SQLite begins with the kinds where the name is asked for, with a
// session's spans where the session is, and else with the rows. Each join says twice where the other lies, so that it
// can be gone both ways; how likely that is, is about the share of a span in a large file, which SQLite can't know. The
// session is that of the span: an event of nobody's has none.
std::string allEvents() {
  const std::string select(kSelectEvents);
  std::string sql = select.substr(0, select.find(" CROSS JOIN"));
  sql.replace(sql.find("r.session AS session"), 9, "s.session");
  return sql +
         " JOIN event_texts AS k ON k.id = 2 * (r.id - r.kind) + 1 AND r.id BETWEEN k.id >> 1 AND (k.id >> 1) + 255 "
         "LEFT JOIN session_spans AS s ON s.session = r.session AND s.first = (r.id & -256) AND "
         "likelihood(r.id >= s.first, 0.003) AND likelihood(r.id <= s.first + 255, 0.003)" +
         select.substr(select.find(" LEFT JOIN"));
}

std::vector<std::pair<std::string_view, std::string>> makeViews() {
  std::vector<std::pair<std::string_view, std::string>> views;
  views.emplace_back("events", "CREATE VIEW events AS " + allEvents());
  // Nearly every name is one of these, so the kinds don't tell where to look.
  const std::string messages =
      "SELECT id, time, session" + keysOf("payload", kMessageKeys) +
      ", payload FROM events WHERE +backend = 'tally' AND +name GLOB 'sys.oxbow.tarnkit.*' AND "
      "payload ->> '$.audiotag' IS NOT NULL";
  views.emplace_back("v_messages", "CREATE VIEW v_messages AS " + messages);
  views.emplace_back("v_volume", derivedView("v_volume", "Volume.Summary", kVolumeKeys));
  views.emplace_back("v_input", derivedView("v_input", "Input.Summary", kInputKeys));
  views.emplace_back("v_group", derivedView("v_group", "Lagoon.Summary", kGroupKeys));
  views.emplace_back("v_summaries", derivedView("v_summaries", "Session_Generic.Summary", kSummaryKeys));
  // Most messages have none, which the text tells without being read as JSON.
  views.emplace_back(
      "v_issues",
      "CREATE VIEW v_issues AS SELECT id, time, session, payload ->> '$.audiotag' AS audiotag, payload "
      "->> '$.HostApplicationDisplayID' AS application, payload ->> '$.issue_type' AS issue_type, "
      "payload ->> '$.node' AS node, payload ->> '$.rtaid_client' AS rtaid_client, payload ->> "
      "'$.any_channel_silence_seconds' AS silence_seconds FROM events WHERE +backend = 'tally' AND +name "
      "GLOB 'sys.oxbow.tarnkit.*' AND instr(payload, '\"issue_type\":') > 0 AND payload ->> "
      "'$.issue_type' IS NOT NULL");
  views.emplace_back("v_drivers",
                     std::string("CREATE VIEW v_drivers AS SELECT r.id AS id, r.time AS time, r.session AS session, "
                                 "lower(substr(k.name, 25)) AS kind, c.key AS channel, c.value AS value FROM "
                                 "event_texts AS k CROSS JOIN event_rows AS r ON r.id BETWEEN k.id >> 1 AND (k.id >> "
                                 "1) + 255 AND r.kind = r.id - (k.id >> 1) CROSS JOIN event_texts AS p ON p.id = 2 * "
                                 "(r.id - r.payload) CROSS JOIN json_each(p.text) AS c WHERE k.backend = 'tally' AND "
                                 "k.name IN ('sys.oxbow.tarnkit.Flume.Simple', 'sys.oxbow.tarnkit.Flume.Histogram', "
                                 "'sys.oxbow.tarnkit.Flume.State') AND c.key GLOB '*_' || substr(k.name, 25) || '_*'"));
  return views;
}

}  // namespace

std::span<const Made> storeViews() {
  static const std::vector<std::pair<std::string_view, std::string>> texts = makeViews();
  static const std::vector<Made> views = [] {
    std::vector<Made> all;
    for (const auto& [name, sql] : texts) {
      all.push_back({name, sql});
    }
    return all;
  }();
  return views;
}

}  // namespace tarn::recorder
