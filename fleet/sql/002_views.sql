-- SPDX-License-Identifier: Apache-2.0
-- What is asked: the derived views of a device's own store under the same names, the hours, and the account.

-- Each message once, with what most have.
CREATE VIEW v_messages AS SELECT device, run, id, time, session,
    payload ->> 'audiotag' AS audiotag, payload ->> 'HostApplicationDisplayID' AS application,
    payload ->> 'tarnreporting_timestamp' AS happened, payload ->> 'session_output_running' AS output_running,
    payload ->> 'session_input_running' AS input_running, number_of(payload -> 'KvSessionVolume') AS volume,
    payload ->> 'active_devices' AS devices, payload ->> 'session_selected_format' AS format,
    number_of(payload -> 'session_duration') AS duration, payload ->> 'issue_type' AS issue_type, payload
  FROM events
  WHERE backend = 'tally' AND name LIKE 'sys.oxbow.tarnkit.%' AND payload ->> 'audiotag' IS NOT NULL;

CREATE VIEW v_volume AS SELECT device, run, id, time, session,
    payload ->> 'HostApplicationDisplayID' AS application, number_of(payload -> 'play_seconds') AS play_seconds,
    number_of(payload -> 'KvSessionVolume') AS volume, payload ->> 'active_devices' AS devices,
    payload ->> 'session_selected_format' AS format, payload ->> 'mFormatID' AS format_id,
    number_of(payload -> 'mChannelsPerFrame') AS channels, payload ->> 'spatializationEnabled' AS spatialization,
    payload ->> 'spatial-audio-accessory-feature' AS spatial_accessory, payload ->> 'ringerstate' AS ringer,
    number_of(payload -> 'msgidx') AS msgidx, number_of(payload -> 'msgcnt') AS msgcnt
  FROM events WHERE backend = 'tally' AND name = 'sys.oxbow.tarnkit.Volume.Summary';

CREATE VIEW v_input AS SELECT device, run, id, time, session,
    payload ->> 'HostApplicationDisplayID' AS application,
    number_of(payload -> 'inputrunning_seconds') AS input_seconds, payload ->> 'active_devices' AS devices,
    payload ->> 'vocoders' AS vocoders, payload ->> 'vp_config_operation_mode' AS operation_mode,
    payload ->> 'vp_config_input_port' AS input_port, number_of(payload -> 'msgidx') AS msgidx,
    number_of(payload -> 'msgcnt') AS msgcnt
  FROM events WHERE backend = 'tally' AND name = 'sys.oxbow.tarnkit.Input.Summary';

CREATE VIEW v_group AS SELECT device, run, id, time, session,
    payload ->> 'HostApplicationDisplayID' AS application, number_of(payload -> 'play_seconds') AS play_seconds,
    payload ->> 'active_devices' AS devices, payload ->> 'session_selected_format' AS format,
    payload ->> 'mFormatID' AS format_id, number_of(payload -> 'mChannelsPerFrame') AS channels,
    number_of(payload -> 'msgidx') AS msgidx, number_of(payload -> 'msgcnt') AS msgcnt
  FROM events WHERE backend = 'tally' AND name = 'sys.oxbow.tarnkit.Lagoon.Summary';

CREATE VIEW v_summaries AS SELECT device, run, id, time, session,
    payload ->> 'HostApplicationDisplayID' AS application, payload ->> 'summaryServiceName' AS service_name,
    payload ->> 'clientProcessName' AS process, number_of(payload -> 'total_active_time') AS total_active_time,
    number_of(payload -> 'active_count') AS active_count,
    number_of(payload -> 'average_active_time') AS average_active_time,
    number_of(payload -> 'overload_count') AS overload_count, number_of(payload -> 'num_messages') AS num_messages,
    number_of(payload -> 'num_unique_messages') AS num_unique_messages,
    number_of(payload -> 'num_redundant_messages') AS num_redundant_messages,
    payload ->> 'singleMessageSession' AS single_message_session, payload ->> 'thermal_state' AS thermal_state,
    payload ->> 'low_power_enabled' AS low_power, number_of(payload -> 'vmInfo_phys_footprint_MiB') AS footprint_mib,
    number_of(payload -> 'load_avg_1_min') AS load_1_min
  FROM events WHERE backend = 'tally' AND name = 'sys.oxbow.tarnkit.Session_Generic.Summary';

CREATE VIEW v_issues AS SELECT device, run, id, time, session, payload ->> 'audiotag' AS audiotag,
    payload ->> 'HostApplicationDisplayID' AS application, payload ->> 'issue_type' AS issue_type,
    payload ->> 'node' AS node, payload ->> 'rtaid_client' AS rtaid_client,
    number_of(payload -> 'any_channel_silence_seconds') AS silence_seconds
  FROM events
  WHERE backend = 'tally' AND name LIKE 'sys.oxbow.tarnkit.%' AND payload ->> 'issue_type' IS NOT NULL;

CREATE VIEW v_drivers AS SELECT device, run, id, time, session, lower(substr(name, 25)) AS kind, c.key AS channel,
    c.value AS value
  FROM events, jsonb_each_text(payload) AS c
  WHERE backend = 'tally' AND name IN ('sys.oxbow.tarnkit.Flume.Simple', 'sys.oxbow.tarnkit.Flume.Histogram',
    'sys.oxbow.tarnkit.Flume.State') AND position('_' || substr(name, 25) || '_' IN c.key) > 0;

CREATE VIEW hours AS SELECT hour, application, route, release, sum(segments)::bigint AS segments,
    sum(play_seconds) AS play_seconds, sum(overloads)::bigint AS overloads
  FROM hour_parts GROUP BY hour, application, route, release;

CREATE VIEW hour_volumes AS SELECT hour, application, route, release, tenth, sum(play_seconds) AS play_seconds
  FROM hour_volume_parts GROUP BY hour, application, route, release, tenth;

CREATE FUNCTION count_of(ids int8multirange) RETURNS bigint LANGUAGE sql IMMUTABLE PARALLEL SAFE AS
$$ SELECT coalesce(sum(upper(r) - lower(r)), 0)::bigint FROM unnest(ids) AS r $$;

-- What became of all ids that a device told of. An id counts once: as stored, else as left out on the device, else as
-- gone before it could leave; `missing` has none of these. `untold`: below the greatest that was told of, and nobody
-- told of it yet. `records` are rows; ids of a device whose store was replaced can have two.
CREATE VIEW account AS
  WITH kept AS (
    SELECT device, range_agg(int8range(id, id, '[]')) AS ids, count(*) AS records FROM events GROUP BY device),
  dropped AS (
    SELECT device, range_agg(r) AS ids, sum(upper(r) - lower(r))::bigint AS records
    FROM expired, unnest(ids) AS r GROUP BY device),
  gone AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM gaps GROUP BY device),
  ranges AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM told GROUP BY device),
  held AS (SELECT device, range_agg(r) AS ids FROM told, unnest(left_out) AS r GROUP BY device),
  sets AS (
    SELECT devices.id, devices.name, coalesce(ranges.ids, '{}') AS told,
        coalesce(kept.ids, '{}') + coalesce(dropped.ids, '{}') AS stored, coalesce(held.ids, '{}') AS left_out,
        coalesce(gone.ids, '{}') AS gaps, coalesce(kept.records, 0) + coalesce(dropped.records, 0) AS records
      FROM devices LEFT JOIN kept ON kept.device = devices.id LEFT JOIN dropped ON dropped.device = devices.id
        LEFT JOIN gone ON gone.device = devices.id LEFT JOIN ranges ON ranges.device = devices.id
        LEFT JOIN held ON held.device = devices.id)
  SELECT id AS device, name, count_of(told) AS made, count_of(stored) AS stored, count_of(gaps - stored - left_out) AS gaps,
    count_of(left_out - stored) AS left_out, count_of(told - stored - gaps - left_out) AS missing,
    coalesce(upper(told) - 1, 0) - count_of(told) AS untold, records FROM sets;
