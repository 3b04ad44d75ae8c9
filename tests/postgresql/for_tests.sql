-- For tests alone: the server's clock follows the one that a test has stopped.
\connect keldoauth
CREATE TABLE keldoauth.test_clock(seconds bigint);
INSERT INTO keldoauth.test_clock VALUES (NULL);
GRANT SELECT, UPDATE ON keldoauth.test_clock TO keldoauth;
CREATE OR REPLACE FUNCTION keldoauth.sqlite_strftime(format text, moment text) RETURNS bigint
LANGUAGE sql VOLATILE AS $$
  SELECT coalesce(seconds, floor(extract(epoch FROM clock_timestamp()))::bigint)
  FROM keldoauth.test_clock
$$;

-- The tables as the first store leaves them, where they are there: what a test
-- that wants none drops. A commit of its own need not be waited for.
CREATE OR REPLACE FUNCTION keldoauth.test_empty() RETURNS void
LANGUAGE plpgsql SET synchronous_commit = off AS $$
DECLARE
  name text;
BEGIN
  DELETE FROM keldoauth.oauth_key;
  FOREACH name IN ARRAY ARRAY['clientinfo', 'grantcode', 'token', 'log', 'meta'] LOOP
    CONTINUE WHEN to_regclass('keldoauth.oauth_' || name) IS NULL;
    EXECUTE 'DELETE FROM keldoauth.oauth_' || name;
  END LOOP;
  IF name = 'meta' AND to_regclass('keldoauth.oauth_meta') IS NOT NULL THEN
    EXECUTE $x$ INSERT INTO keldoauth.oauth_meta
      VALUES ('oauth_clientInfo', 2), ('oauth_grantCode', 2), ('oauth_token', 2) $x$;
  END IF;
END $$;
