-- SPDX-License-Identifier: Apache-2.0
-- What questions over all devices are answered from in seconds, however many events there are: counts that the
-- collectors keep, and views of them over time. Applied once, in one transaction, by tarnreporting-collect.

-- Nobody is about to add an event that isn't counted.
SELECT pg_advisory_xact_lock(7496301, 3);

-- Events of each device that were ever stored, dropped days included. By keeper, as the hours are.
CREATE TABLE stored_parts(
  device integer NOT NULL,
  keeper smallint NOT NULL,
  records bigint NOT NULL,
  PRIMARY KEY (device, keeper)) WITH (fillfactor = 70);

-- What detectors and clients told of by `issue_type`.
CREATE TABLE hour_issue_parts(
  hour timestamptz NOT NULL,
  issue_type text NOT NULL,
  keeper smallint NOT NULL,
  issues bigint NOT NULL,
  PRIMARY KEY (hour, issue_type, keeper)) WITH (fillfactor = 70);

-- The newest sessions of all devices, without looking at the others.
CREATE INDEX sessions_by_time ON sessions(created, run, id);

INSERT INTO stored_parts SELECT device, 0, sum(records) FROM (
    SELECT device, count(*) AS records FROM events GROUP BY device
    UNION ALL SELECT device, sum(count_of(ids)) FROM expired GROUP BY device) AS s GROUP BY device;
INSERT INTO hour_issue_parts SELECT date_trunc('hour', time, 'UTC'), left(issue_type, 200), 0, count(*)
  FROM v_issues GROUP BY 1, 2;

CREATE VIEW hour_issues AS SELECT hour, issue_type, sum(issues)::bigint AS issues
  FROM hour_issue_parts GROUP BY hour, issue_type;

-- What `account` says, by counts instead of by the ids themselves: in the time that it takes to read what messages
-- told. They say the same unless an id is more than one thing, as when a device's store was replaced by another one;
-- `surplus` is how many things there are beyond the ids, and where it isn't 0 `account` knows more.
CREATE VIEW account_by_counts AS
  WITH kept AS (SELECT device, sum(records)::bigint AS records FROM stored_parts GROUP BY device),
  gone AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM gaps GROUP BY device),
  ranges AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM told GROUP BY device),
  held AS (SELECT device, range_agg(r) AS ids FROM told, unnest(left_out) AS r GROUP BY device),
  sets AS (
    SELECT devices.id, devices.name, coalesce(ranges.ids, '{}') AS told, coalesce(held.ids, '{}') AS left_out,
        coalesce(gone.ids, '{}') AS gaps, coalesce(kept.records, 0) AS records
      FROM devices LEFT JOIN kept ON kept.device = devices.id LEFT JOIN gone ON gone.device = devices.id
        LEFT JOIN ranges ON ranges.device = devices.id LEFT JOIN held ON held.device = devices.id),
  counts AS (
    SELECT id AS device, name, count_of(told) AS made, records, count_of(gaps - left_out) AS gaps,
        count_of(left_out) AS left_out, coalesce(upper(told) - 1, 0) - count_of(told) AS untold FROM sets)
  SELECT device, name, made, records, gaps, left_out, greatest(0, made - records - gaps - left_out) AS missing, untold,
    greatest(0, records + gaps + left_out - made) AS surplus FROM counts;

-- Over time, for what draws it: `time`, what it is of, and numbers.
CREATE VIEW series_play AS SELECT hour AS time, application, route, release, segments, play_seconds / 3600 AS play_hours,
    overloads FROM hours;
CREATE VIEW series_volume AS SELECT hour AS time, application, route, release, tenth / 10.0 AS volume,
    play_seconds / 3600 AS play_hours FROM hour_volumes;
CREATE VIEW series_issues AS SELECT hour AS time, issue_type, issues FROM hour_issues;
CREATE VIEW series_sessions AS SELECT date_trunc('hour', s.created, 'UTC') AS time, s.service_name, r.version AS release,
    count(*) AS sessions, count(DISTINCT s.device) AS devices
  FROM sessions AS s JOIN runs AS r ON r.key = s.run GROUP BY 1, 2, 3;
