-- What a server needs before the stores can be on it. To be run by a superuser,
-- once, and again after an update; it changes no row:
--
--   psql -d postgres -f keldoauth.sql
--   psql -d postgres -v database=oauth -v role=oauth -f keldoauth.sql
--
-- The role gets no password here: \password keldoauth, or what pg_hba.conf asks.

\set ON_ERROR_STOP on
\if :{?database} \else \set database keldoauth \endif
\if :{?role} \else \set role keldoauth \endif

SELECT format('CREATE ROLE %I LOGIN', :'role')
WHERE NOT EXISTS (SELECT FROM pg_roles WHERE rolname = :'role') \gexec

-- SQL_ASCII and C: a text is its bytes, whatever they are, as in SQLite's file.
-- Any other encoding refuses what is none of its own, and any other collation
-- finds other texts equal, or in another order.
SELECT format('CREATE DATABASE %I OWNER %I ENCODING ''SQL_ASCII'' LC_COLLATE ''C'' '
              'LC_CTYPE ''C'' TEMPLATE template0', :'database', :'role')
WHERE NOT EXISTS (SELECT FROM pg_database WHERE datname = :'database') \gexec

SELECT format('REVOKE ALL ON DATABASE %I FROM PUBLIC', :'database') \gexec

-- Settings of the database ----------------------------------------------------

-- Nothing of a statement, and with it no code, token or identifier, in the
-- server's log: neither the statement, nor the values that an error quotes, nor
-- what the postmaster says of a backend that crashed, which it takes from the
-- activity that a session shows.
SELECT format('ALTER DATABASE %I SET %s', :'database', setting) FROM unnest(ARRAY[
  'log_statement = ''none''',
  'log_min_duration_statement = -1',
  'log_min_duration_sample = -1',
  'log_transaction_sample_rate = 0',
  'log_duration = off',
  'log_min_error_statement = ''panic''',
  'log_min_messages = ''fatal''',
  'log_error_verbosity = ''terse''',
  'log_parameter_max_length = 0',
  'log_parameter_max_length_on_error = 0',
  'log_lock_waits = off',
  'track_activities = off',
  'lc_messages = ''C''',
-- What was acknowledged is on the disk, and on the synchronous standbys that
-- synchronous_standby_names asks for.
  'synchronous_commit = ''on''',
-- The server gives up before the stores do, so that they know what happened. A
-- box that dies within a transaction holds the lock for fifteen seconds at most; the longest that
-- one waits for itself, with an audit entry on another connection, is ten.
  'statement_timeout = ''8s''',
  'idle_in_transaction_session_timeout = ''15s''',
  'client_connection_check_interval = ''1s''',
  'tcp_keepalives_idle = 5',
  'tcp_keepalives_interval = 2',
  'tcp_keepalives_count = 3',
  'tcp_user_timeout = ''10s''',
-- One statement after the other, each on what has been committed before it, as
-- the lock for changes has it.
  'default_transaction_isolation = ''read committed''',
  'standard_conforming_strings = on',
  'client_min_messages = ''warning'''
]) AS setting \gexec

\connect :"database"
SET client_min_messages = warning;
BEGIN;

CREATE SCHEMA IF NOT EXISTS keldoauth;
SELECT format('GRANT USAGE, CREATE ON SCHEMA keldoauth TO %I', :'role') \gexec
REVOKE ALL ON SCHEMA public FROM PUBLIC;

-- Changes ---------------------------------------------------------------------

-- One text that the stores' key encrypted: a box that encrypts it otherwise has
-- another key, and would neither find a client nor store one that others find.
-- The column has the name of those that are encrypted, so that a change of the
-- key takes it along.
CREATE TABLE IF NOT EXISTS keldoauth.oauth_key(
  client_id text COLLATE "C" NOT NULL,
  id bigint PRIMARY KEY CHECK (id = 1));
SELECT format('GRANT SELECT, INSERT, UPDATE, DELETE ON keldoauth.oauth_key TO %I', :'role') \gexec

-- The lock that SQLite takes for a change: one changes at a time, and waits for
-- it as long as a statement of the stores does. It ends with the transaction,
-- and with the connection of whoever was killed. The first that changes anything
-- says which key the store has.
CREATE OR REPLACE FUNCTION keldoauth.write_lock(seal text) RETURNS void
LANGUAGE plpgsql SET lock_timeout = '5s' AS $$
DECLARE
  stored text;
BEGIN
  PERFORM pg_advisory_xact_lock(0, 1);
  SELECT client_id INTO stored FROM keldoauth.oauth_key;
  IF NOT FOUND THEN
    INSERT INTO keldoauth.oauth_key(client_id, id) VALUES (seal, 1);
  ELSIF stored <> seal THEN
    RAISE SQLSTATE 'KO001' USING MESSAGE = 'the key is another';
  END IF;
END $$;

-- SQLite's next id is the largest one and one more, so that the ids of rows that
-- were the last are given again; beyond the largest number it looks for one that
-- is free. A sequence would do neither.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_next_id() RETURNS trigger
LANGUAGE plpgsql AS $$
DECLARE
  largest bigint;
  isTaken boolean := true;
BEGIN
  EXECUTE format('SELECT max(id) FROM %I.%I', TG_TABLE_SCHEMA, TG_TABLE_NAME) INTO largest;
  IF largest IS DISTINCT FROM 9223372036854775807 THEN
    NEW.id := coalesce(greatest(largest, 0), 0) + 1;
    RETURN NEW;
  END IF;
  WHILE isTaken LOOP
    NEW.id := floor(random() * 4611686018427387904)::bigint + 1;
    EXECUTE format('SELECT EXISTS (SELECT FROM %I.%I WHERE id = $1)',
                   TG_TABLE_SCHEMA, TG_TABLE_NAME) INTO isTaken USING NEW.id;
  END LOOP;
  RETURN NEW;
END $$;

-- The catalogue ---------------------------------------------------------------

-- The tables that the stores created, by the names that they gave them: the
-- server folds those, and keeps them as they were with the table.
CREATE OR REPLACE VIEW keldoauth.sqlite_master AS
SELECT 'table'::text COLLATE "C" AS type, description COLLATE "C" AS name,
       description COLLATE "C" AS tbl_name, 0 AS rootpage, NULL::text AS sql
FROM pg_class JOIN pg_description
  ON objoid = pg_class.oid AND classoid = 'pg_class'::regclass AND objsubid = 0
WHERE relnamespace = 'keldoauth'::regnamespace AND relkind = 'r';
SELECT format('GRANT SELECT ON keldoauth.sqlite_master TO %I', :'role') \gexec

-- Functions of SQLite's -------------------------------------------------------

-- CAST(x AS INTEGER): the digits in front, as far as there are any, within 64
-- bits. As a numeric, since SQLite's sums do not overflow.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_integer(value text) RETURNS numeric
LANGUAGE sql IMMUTABLE AS $$
  SELECT least(greatest(coalesce(substring(value, '^[ \t\n\v\f\r]*([-+]?[0-9]+)'), '0')::numeric,
                        -9223372036854775808), 9223372036854775807)
$$;
CREATE OR REPLACE FUNCTION keldoauth.sqlite_integer(value numeric) RETURNS numeric
LANGUAGE sql IMMUTABLE AS $$ SELECT trunc(value) $$;

-- SUM of numbers, or of conditions, which are 0 and 1 to SQLite.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_add(total numeric, value boolean) RETURNS numeric
LANGUAGE sql IMMUTABLE AS $$ SELECT coalesce(total, 0) + coalesce(value::int, 0) $$;
CREATE OR REPLACE AGGREGATE keldoauth.sqlite_sum(boolean)(
  SFUNC = keldoauth.sqlite_add, STYPE = numeric);
CREATE OR REPLACE FUNCTION keldoauth.sqlite_add(total numeric, value numeric) RETURNS numeric
LANGUAGE sql IMMUTABLE AS $$ SELECT coalesce(total, 0) + coalesce(value, 0) $$;
CREATE OR REPLACE AGGREGATE keldoauth.sqlite_sum(numeric)(
  SFUNC = keldoauth.sqlite_add, STYPE = numeric);

-- Of bytes: what the stores look for in a text is ASCII, and stands in front.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_substr(value text, first numeric,
                                                   count numeric DEFAULT 2147483647)
RETURNS text LANGUAGE sql IMMUTABLE AS $$
  SELECT CASE WHEN count <= 0 OR first > 1000000000 THEN ''
              ELSE substr(value, greatest(first, 1)::int,
                          least(count + least(first - 1, 0), 1000000000)::int) END
$$;
CREATE OR REPLACE FUNCTION keldoauth.sqlite_instr(value text, part text) RETURNS int
LANGUAGE sql IMMUTABLE AS $$ SELECT strpos(value, part) $$;
CREATE OR REPLACE FUNCTION keldoauth.sqlite_length(value text) RETURNS int
LANGUAGE sql IMMUTABLE AS $$ SELECT octet_length(value) $$;

-- strftime('%s','now'): the one clock that all boxes write the log by.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_strftime(format text, moment text) RETURNS bigint
LANGUAGE plpgsql VOLATILE AS $$
BEGIN
  IF format <> '%s' OR moment <> 'now' THEN
    RAISE 'only strftime(''%%s'',''now'') is known';
  END IF;
  RETURN floor(extract(epoch FROM clock_timestamp()));
END $$;

-- What LIKE looks for, as a regular expression for ~*: capitals of ASCII alone
-- are no difference, a percent sign is anything, and an underscore one character
-- of UTF-8, or what SQLite takes for one.
CREATE OR REPLACE FUNCTION keldoauth.sqlite_like(pattern text) RETURNS text
LANGUAGE plpgsql IMMUTABLE AS $$
BEGIN
  IF octet_length(pattern) > 50000 THEN
    RAISE 'LIKE or GLOB pattern too complex';
  END IF;
  RETURN '^' || replace(replace(
      regexp_replace(pattern, '([].^$*+?(){}|[\\])', '\\\1', 'g'),
      '%', '.*'),
      '_', '(?:[\x01-\x7f\x80-\xbf]|[\xc0-\xff][\x80-\xbf]*)') || '$';
END $$;

-- For people ------------------------------------------------------------------

-- The server and its standbys, for `keldoauth status`. What a session of the
-- role may not see by itself the owner of the function sees for it.
CREATE OR REPLACE FUNCTION keldoauth.standbys()
RETURNS TABLE(name text, state text, sync text, lag_bytes bigint)
LANGUAGE sql SECURITY DEFINER SET search_path = pg_catalog AS $$
  SELECT application_name, state, sync_state,
         pg_wal_lsn_diff(pg_current_wal_lsn(), replay_lsn)::bigint
  FROM pg_stat_replication ORDER BY application_name
$$;
CREATE OR REPLACE VIEW keldoauth.server_standbys AS SELECT * FROM keldoauth.standbys();
CREATE OR REPLACE VIEW keldoauth.server_settings AS
SELECT name, setting FROM pg_settings
WHERE name IN ('server_version', 'fsync', 'full_page_writes', 'synchronous_commit',
               'synchronous_standby_names', 'log_statement', 'log_min_error_statement',
               'log_min_messages', 'log_min_duration_statement', 'track_activities')
ORDER BY name;
CREATE OR REPLACE VIEW keldoauth.server_address AS
SELECT coalesce(host(inet_server_addr()), 'this box') AS address, setting AS port,
       pg_postmaster_start_time()::text AS since
FROM pg_settings WHERE name = 'port';
SELECT format('GRANT SELECT ON keldoauth.server_standbys, keldoauth.server_settings, '
              'keldoauth.server_address TO %I',
              :'role') \gexec

COMMIT;
