// What the server is asked in the place of SQLite's statements.

#include "engines/postgresql/statement.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

using keldoauth::postgresql::Statement;
using keldoauth::postgresql::statementsOf;
using Kind = Statement::Kind;

namespace {

std::string rewritten(const std::string& sql) {
  const std::vector<Statement> statements = statementsOf(sql);
  return statements.size() == 1 ? statements.front().text : "not one statement";
}

Kind kindOf(const std::string& sql) {
  return statementsOf(sql).at(0).kind;
}

std::string refusalOf(const std::string& sql) {
  const Statement last = statementsOf(sql).back();
  return last.kind == Kind::kRefused ? last.text : "not refused";
}

}  // namespace

TEST(StatementTest, RowsComeInTheOrderOfTheirIds) {
  EXPECT_EQ(rewritten("SELECT * FROM oauth_token WHERE state='x' ;"),
            "SELECT * FROM keldoauth.\"oauth_token\" WHERE \"state\" = 'x' ORDER BY \"id\"");
  EXPECT_EQ(rewritten("SELECT * FROM oauth_log LIMIT 3"),
            "SELECT * FROM keldoauth.\"oauth_log\" ORDER BY \"id\" LIMIT 3");
}

TEST(StatementTest, AnOrderThatLeavesTiesIsCompleted) {
  EXPECT_EQ(rewritten("SELECT * FROM oauth_log ORDER BY timestamp DESC LIMIT 5 OFFSET 2"),
            "SELECT * FROM keldoauth.\"oauth_log\" ORDER BY \"timestamp\" DESC , \"id\" LIMIT 5 "
            "OFFSET 2");
}

TEST(StatementTest, TablesWithoutIdsHaveNoOrder) {
  EXPECT_EQ(rewritten("SELECT * FROM oauth_meta"), "SELECT * FROM keldoauth.\"oauth_meta\"");
}

TEST(StatementTest, ANegativeLimitIsNone) {
  EXPECT_EQ(rewritten("DELETE FROM t WHERE a IN (SELECT a FROM t ORDER BY a LIMIT -1 OFFSET 9)"),
            "DELETE FROM keldoauth.\"t\" WHERE \"a\" IN ( SELECT \"a\" FROM keldoauth.\"t\" ORDER "
            "BY \"a\" LIMIT ALL OFFSET 9 )");
}

TEST(StatementTest, CapitalsOfNamesAreNoDifferenceAndThoseOfTextsStay) {
  EXPECT_EQ(rewritten("update oauth_clientInfo set SCOPE='Read' where ID='7'"),
            "update keldoauth.\"oauth_clientinfo\" set \"scope\" = 'Read' where \"id\" = 7");
}

TEST(StatementTest, ATextThatIsNoNumberIsEqualToNone) {
  EXPECT_EQ(rewritten("DELETE FROM t WHERE id='x' OR id=''"),
            "DELETE FROM keldoauth.\"t\" WHERE \"id\" = NULL OR \"id\" = NULL");
}

TEST(StatementTest, TextsAreCopiedAsTheyAre) {
  EXPECT_EQ(rewritten("INSERT INTO t (a) VALUES('it''s \\ \xff; -- /* $1 \"')"),
            "INSERT INTO keldoauth.\"t\" ( \"a\" ) VALUES ( 'it''s \\ \xff; -- /* $1 \"' )");
}

TEST(StatementTest, NumbersMayStandForConditions) {
  EXPECT_EQ(rewritten("DELETE FROM t WHERE 1 AND a='x' AND NOT 0"),
            "DELETE FROM keldoauth.\"t\" WHERE (1<>0) AND \"a\" = 'x' AND NOT (0<>0)");
  EXPECT_EQ(rewritten("DELETE FROM t WHERE id BETWEEN 3 AND 5"),
            "DELETE FROM keldoauth.\"t\" WHERE \"id\" BETWEEN 3 AND 5");
  EXPECT_EQ(rewritten("DELETE FROM t WHERE a<CASE WHEN 0 THEN 1 ELSE 2 END"),
            "DELETE FROM keldoauth.\"t\" WHERE \"a\" < CASE WHEN (0<>0) THEN 1 ELSE 2 END");
}

TEST(StatementTest, PartsOfAStatementHaveNames) {
  EXPECT_EQ(rewritten("SELECT n,part.* FROM (SELECT COUNT(*) AS n FROM t) AS whole LEFT JOIN "
                      "(SELECT id FROM t AS u LIMIT -1 OFFSET 0) AS part ON 1 ORDER BY id"),
            "SELECT \"n\" , \"part\" . * FROM ( SELECT count ( * ) AS \"n\" FROM "
            "keldoauth.\"t\" ) AS \"whole\" LEFT JOIN ( SELECT \"id\" FROM keldoauth.\"t\" AS "
            "\"u\" LIMIT ALL OFFSET 0 ) AS \"part\" ON (1<>0) ORDER BY \"id\"");
  EXPECT_EQ(rewritten("SELECT * FROM (SELECT COUNT(*) FROM t) AS a"),
            "SELECT * FROM ( SELECT count ( * ) FROM keldoauth.\"t\" ) AS \"a\"");
}

TEST(StatementTest, FunctionsAreThoseOfTheSchema) {
  EXPECT_EQ(rewritten("SELECT IFNULL(SUM(CAST(a AS INTEGER)<3),0) FROM t"),
            "SELECT coalesce ( keldoauth.sqlite_sum ( keldoauth.sqlite_integer ( \"a\" ) < 3 ) , 0 "
            ") FROM keldoauth.\"t\"");
  EXPECT_EQ(refusalOf("SELECT pg_sleep(9)"), "no such function: pg_sleep");
}

TEST(StatementTest, LikeKnowsNoCapitals) {
  EXPECT_EQ(rewritten("DELETE FROM t WHERE a like '%x_%'"),
            "DELETE FROM keldoauth.\"t\" WHERE \"a\" ~* keldoauth.sqlite_like('%x_%')");
  EXPECT_EQ(rewritten("DELETE FROM t WHERE a NOT LIKE 'b'"),
            "DELETE FROM keldoauth.\"t\" WHERE \"a\" !~* keldoauth.sqlite_like('b')");
}

TEST(StatementTest, TablesAreMadeWithTheTypesOfSqlite) {
  const Statement made = statementsOf(
                             "CREATE TABLE IF NOT EXISTS oauth_Log(timestamp integer NOT NULL, msg "
                             "text NOT NULL UNIQUE, "
                             "id integer PRIMARY KEY);")
                             .at(0);
  EXPECT_EQ(made.kind, Kind::kCreateIfAbsent);
  EXPECT_EQ(made.table, "oauth_Log");
  EXPECT_EQ(made.text,
            "CREATE TABLE IF NOT EXISTS keldoauth.\"oauth_log\" ( \"timestamp\" bigint NOT NULL , "
            "\"msg\" text COLLATE \"C\" NOT NULL UNIQUE , \"id\" bigint PRIMARY KEY );COMMENT ON "
            "TABLE keldoauth.\"oauth_log\" IS 'oauth_Log';CREATE OR REPLACE TRIGGER sqlite_id "
            "BEFORE INSERT ON keldoauth.\"oauth_log\" FOR EACH ROW WHEN (NEW.id IS NULL) EXECUTE "
            "FUNCTION keldoauth.sqlite_next_id()");
}

TEST(StatementTest, EveryStatementHasItsKind) {
  EXPECT_EQ(kindOf("BEGIN IMMEDIATE"), Kind::kBeginImmediate);
  EXPECT_EQ(kindOf("BEGIN"), Kind::kBegin);
  EXPECT_EQ(kindOf("COMMIT"), Kind::kCommit);
  EXPECT_EQ(kindOf("ROLLBACK"), Kind::kRollback);
  EXPECT_EQ(kindOf("PRAGMA synchronous=EXTRA;"), Kind::kPragma);
  EXPECT_EQ(kindOf("SELECT changes()"), Kind::kChanges);
  EXPECT_EQ(kindOf("DROP TABLE IF EXISTS t;"), Kind::kWrite);
  EXPECT_EQ(kindOf("SELECT COUNT(*) FROM t;"), Kind::kRead);
}

TEST(StatementTest, NothingIsRunThatSqliteWouldRefuse) {
  EXPECT_EQ(refusalOf("DELETE FROM t WHERE \\"), "unrecognized token: \"\\\"");
  EXPECT_EQ(refusalOf("INSERT INTO t (a) VALUES('cut off"), "unrecognized token: \"'cut off\"");
  EXPECT_EQ(refusalOf("nonsense"), "near \"nonsense\": syntax error");
  EXPECT_EQ(refusalOf("SELECT * FROM t WHERE a=$1"), "unrecognized token: \"$1\"");
}

TEST(StatementTest, NothingRunsThatTheServerHasBeyondSqlite) {
  EXPECT_EQ(refusalOf("COPY t TO PROGRAM 'x'"), "near \"COPY\": syntax error");
  EXPECT_EQ(refusalOf("SELECT 1; SET ROLE postgres"), "near \"SET\": syntax error");
  EXPECT_EQ(refusalOf("SELECT a::text FROM t"), "unrecognized token: \"::text FROM t\"");
  EXPECT_EQ(refusalOf("DO $$ x $$"), "unrecognized token: \"$$ x $$\"");
}

TEST(StatementTest, ATextMayHoldSeveralAndCommentsAndNone) {
  EXPECT_EQ(statementsOf("BEGIN; DELETE FROM t; COMMIT;").size(), 3U);
  EXPECT_TRUE(statementsOf("").empty());
  EXPECT_TRUE(statementsOf(" ; -- nothing\n /* at all */ ;").empty());
}
