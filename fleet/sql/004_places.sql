-- SPDX-License-Identifier: Apache-2.0
-- How far devices are by their own word, so that what was lost last of all is missed too. Applied once, in one
-- transaction, by tarnreporting-collect.

-- `made`: the greatest id that the device said that it has told of, when it had nothing more to tell; 0 before that.
ALTER TABLE devices ADD COLUMN made bigint NOT NULL DEFAULT 0;

-- As before; `untold` also counts what is below the device's own word.
CREATE OR REPLACE VIEW account AS
  WITH kept AS (
    SELECT device, range_agg(int8range(id, id, '[]')) AS ids, count(*) AS records FROM events GROUP BY device),
  dropped AS (
    SELECT device, range_agg(r) AS ids, sum(upper(r) - lower(r))::bigint AS records
    FROM expired, unnest(ids) AS r GROUP BY device),
  gone AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM gaps GROUP BY device),
  ranges AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM told GROUP BY device),
  held AS (SELECT device, range_agg(r) AS ids FROM told, unnest(left_out) AS r GROUP BY device),
  sets AS (
    SELECT devices.id, devices.name, devices.made AS place, coalesce(ranges.ids, '{}') AS told,
        coalesce(kept.ids, '{}') + coalesce(dropped.ids, '{}') AS stored, coalesce(held.ids, '{}') AS left_out,
        coalesce(gone.ids, '{}') AS gaps, coalesce(kept.records, 0) + coalesce(dropped.records, 0) AS records
      FROM devices LEFT JOIN kept ON kept.device = devices.id LEFT JOIN dropped ON dropped.device = devices.id
        LEFT JOIN gone ON gone.device = devices.id LEFT JOIN ranges ON ranges.device = devices.id
        LEFT JOIN held ON held.device = devices.id)
  SELECT id AS device, name, count_of(told) AS made, count_of(stored) AS stored, count_of(gaps - stored - left_out) AS gaps,
    count_of(left_out - stored) AS left_out, count_of(told - stored - gaps - left_out) AS missing,
    greatest(upper(told) - 1, place) - count_of(told) AS untold, records FROM sets;

CREATE OR REPLACE VIEW account_by_counts AS
  WITH kept AS (SELECT device, sum(records)::bigint AS records FROM stored_parts GROUP BY device),
  gone AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM gaps GROUP BY device),
  ranges AS (SELECT device, range_agg(int8range(first, last, '[]')) AS ids FROM told GROUP BY device),
  held AS (SELECT device, range_agg(r) AS ids FROM told, unnest(left_out) AS r GROUP BY device),
  sets AS (
    SELECT devices.id, devices.name, devices.made AS place, coalesce(ranges.ids, '{}') AS told, coalesce(held.ids, '{}') AS left_out,
        coalesce(gone.ids, '{}') AS gaps, coalesce(kept.records, 0) AS records
      FROM devices LEFT JOIN kept ON kept.device = devices.id LEFT JOIN gone ON gone.device = devices.id
        LEFT JOIN ranges ON ranges.device = devices.id LEFT JOIN held ON held.device = devices.id),
  counts AS (
    SELECT id AS device, name, count_of(told) AS made, records, count_of(gaps - left_out) AS gaps,
        count_of(left_out) AS left_out, greatest(upper(told) - 1, place) - count_of(told) AS untold FROM sets)
  SELECT device, name, made, records, gaps, left_out, greatest(0, made - records - gaps - left_out) AS missing, untold,
    greatest(0, records + gaps + left_out - made) AS surplus FROM counts;
