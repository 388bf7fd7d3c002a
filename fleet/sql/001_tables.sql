-- SPDX-License-Identifier: Apache-2.0
-- What comes of the devices' records, and what keeps it right: who has it when a record comes twice, and what became of
-- each id that a device told of. Applied once, in one transaction, by tarnreporting-collect.

-- `name` is the device's name as its messages have it, in hexadecimal.
CREATE TABLE devices(
  id integer GENERATED ALWAYS AS IDENTITY PRIMARY KEY,
  name text NOT NULL UNIQUE,
  first_seen timestamptz NOT NULL DEFAULT now());

-- `key` is this database's own, all else the device's. Of two states the one that was looked at later counts.
CREATE TABLE runs(
  key bigint GENERATED ALWAYS AS IDENTITY PRIMARY KEY,
  device integer NOT NULL,
  id bigint NOT NULL,
  boot text NOT NULL,
  version text NOT NULL,
  started timestamptz NOT NULL,
  ended timestamptz,
  end_reason text,
  machine jsonb,
  looked_at bigint NOT NULL,
  UNIQUE (device, id, boot, started)) WITH (fillfactor = 80);

-- `run` is runs.key, here and below.
CREATE TABLE sessions(
  run bigint NOT NULL,
  id bigint NOT NULL,
  device integer NOT NULL,
  process text NOT NULL,
  application text NOT NULL,
  service_type bigint NOT NULL,
  service_name text NOT NULL,
  created timestamptz NOT NULL,
  ended timestamptz,
  end_reason text,
  looked_at bigint NOT NULL,
  PRIMARY KEY (run, id)) WITH (fillfactor = 80);

CREATE TABLE periods(
  run bigint NOT NULL,
  id bigint NOT NULL,
  session bigint NOT NULL,
  device integer NOT NULL,
  started timestamptz NOT NULL,
  stopped timestamptz,
  messages bigint NOT NULL,
  redundant bigint NOT NULL,
  looked_at bigint NOT NULL,
  PRIMARY KEY (run, id)) WITH (fillfactor = 80);

-- `run` is 0 for an event of nobody's; then its time tells it from that of another store of the device.
CREATE TABLE events(
  device integer NOT NULL,
  run bigint NOT NULL,
  id bigint NOT NULL,
  time timestamptz NOT NULL,
  session bigint,
  backend text NOT NULL,
  name text NOT NULL,
  payload jsonb NOT NULL,
  detail jsonb NOT NULL,
  PRIMARY KEY (device, id, run, time)) PARTITION BY RANGE (time);

-- Ids that were gone before they could leave the device.
CREATE TABLE gaps(
  device integer NOT NULL,
  first bigint NOT NULL,
  last bigint NOT NULL,
  PRIMARY KEY (device, first, last));

-- Ranges of ids that messages told of, and which of them the device kept to itself.
CREATE TABLE told(
  device integer NOT NULL,
  first bigint NOT NULL,
  last bigint NOT NULL,
  left_out int8multirange NOT NULL,
  PRIMARY KEY (device, first, last));

-- Ids of events that were here, on days that were dropped. When one of them comes again it isn't taken again.
CREATE TABLE expired(
  day date NOT NULL,
  device integer NOT NULL,
  run bigint NOT NULL,
  ids int8multirange NOT NULL,
  PRIMARY KEY (day, device, run));

-- Messages that nobody could make anything of.
CREATE TABLE refused(
  stream text NOT NULL,
  sequence bigint NOT NULL,
  subject text NOT NULL,
  why text NOT NULL,
  bytes bytea NOT NULL,
  refused_at timestamptz NOT NULL DEFAULT now(),
  PRIMARY KEY (stream, sequence));

-- What was played and what went wrong, by hour. Each collector adds to rows of its own, so that none waits for another;
-- the views `hours` and `hour_volumes` put them together.
CREATE TABLE hour_parts(
  hour timestamptz NOT NULL,
  application text NOT NULL,
  route text NOT NULL,
  release text NOT NULL,
  keeper smallint NOT NULL,
  segments bigint NOT NULL,
  play_seconds double precision NOT NULL,
  overloads bigint NOT NULL,
  PRIMARY KEY (hour, application, route, release, keeper)) WITH (fillfactor = 70);

-- Seconds played at a volume of 0 to 0.1 (tenth 0), and so on.
CREATE TABLE hour_volume_parts(
  hour timestamptz NOT NULL,
  application text NOT NULL,
  route text NOT NULL,
  release text NOT NULL,
  tenth smallint NOT NULL,
  keeper smallint NOT NULL,
  play_seconds double precision NOT NULL,
  PRIMARY KEY (hour, application, route, release, tenth, keeper)) WITH (fillfactor = 70);

-- The number that a JSON value is, null for anything else.
CREATE FUNCTION number_of(value jsonb) RETURNS double precision LANGUAGE sql IMMUTABLE PARALLEL SAFE AS
$$ SELECT CASE jsonb_typeof(value) WHEN 'number' THEN value::double precision END $$;

-- Makes the partition of a day where there is none. It is made beside the table and then joined to it, so that nobody
-- who writes has to wait.
CREATE FUNCTION make_day(of_day date) RETURNS void LANGUAGE plpgsql AS $$
DECLARE
  partition text := 'events_' || to_char(of_day, 'YYYYMMDD');
BEGIN
  PERFORM pg_advisory_xact_lock(7496301, 2);
  -- By a query: a look-up of the name may answer from before the lock was waited for.
  IF EXISTS (SELECT FROM pg_class WHERE relname = partition AND relnamespace = (
      SELECT relnamespace FROM pg_class WHERE oid = 'events'::regclass)) THEN
    RETURN;
  END IF;
  EXECUTE format('CREATE TABLE %I (LIKE events INCLUDING CONSTRAINTS INCLUDING INDEXES)', partition);
  EXECUTE format('ALTER TABLE events ATTACH PARTITION %I FOR VALUES FROM (%L) TO (%L)', partition,
                 of_day::timestamp AT TIME ZONE 'UTC', (of_day + 1)::timestamp AT TIME ZONE 'UTC');
END $$;

-- Drops the oldest day before that one, and keeps in mind which ids it had. Null when there is none.
CREATE FUNCTION forget_a_day_before(that_day date) RETURNS date LANGUAGE plpgsql AS $$
DECLARE
  partition text;
  of_day date;
BEGIN
  -- Whoever writes holds it shared: nobody is about to add to the day.
  PERFORM pg_advisory_xact_lock(7496301, 3);
  SELECT c.relname, to_date(right(c.relname, 8), 'YYYYMMDD') INTO partition, of_day
    FROM pg_inherits AS i JOIN pg_class AS c ON c.oid = i.inhrelid
    WHERE i.inhparent = 'events'::regclass AND to_date(right(c.relname, 8), 'YYYYMMDD') < that_day
    ORDER BY 2 LIMIT 1;
  IF partition IS NULL THEN
    RETURN NULL;
  END IF;
  EXECUTE format('INSERT INTO expired SELECT %L::date, device, run, range_agg(int8range(id, id, ''[]'')) FROM %I '
                 'GROUP BY device, run ON CONFLICT (day, device, run) DO UPDATE SET ids = expired.ids + excluded.ids',
                 of_day, partition);
  EXECUTE format('DROP TABLE %I', partition);
  RETURN of_day;
END $$;
