// keldoauth log.

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::HasSubstr;
using testing::MatchesRegex;
using testing::SizeIs;

class LogCommand : public CliTest {
 protected:
  /// Entries with time stamps 100, 200, ...
  static void write(const std::vector<std::string>& messages) {
    for (const std::string& message : messages) ASSERT_THAT(add(message), ExitsWith(kOk));
    sql("UPDATE oauth_log SET timestamp=100*id");
  }

  static Outcome add(const std::string& message) { return run({"log", "add", "--", message}); }

  static std::vector<std::string> listed(const Arguments& options) {
    Arguments arguments{"log", "list"};
    arguments.insert(arguments.end(), options.begin(), options.end());
    std::vector<std::string> messages;
    const Json::Value answer = json(arguments);
    for (const Json::Value& entry : answer["entries"]) {
      messages.push_back(entry["msg"].asString());
    }
    return messages;
  }
};

TEST_F(LogCommand, AddStoresAnEntry) {
  const Json::Value answer = json({"log", "add", "backup restored"});
  EXPECT_EQ(answer["stored"], Json::Value(true));
  EXPECT_EQ(answer["rows"], Json::Value(1));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "backup restored");
}

TEST_F(LogCommand, AddTellsWhatTheTrimmingLeft) {
  EXPECT_EQ(add("one").out, "Stored; the log holds 1 row.\n");
  writeSettings(R"({"log_max": 1})");
  sql("UPDATE oauth_log SET timestamp=5");
  EXPECT_EQ(add("two").out, "Stored; the log holds 1 row.\n");
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "two");
}

TEST_F(LogCommand, AddTakesAMessageThatLooksLikeAnOption) {
  EXPECT_THAT(add("--json"), ExitsWith(kOk));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "--json");
}

TEST_F(LogCommand, AddNeedsAMessage) {
  const Outcome outcome = run({"log", "add"});
  EXPECT_THAT(outcome, ExitsWith(kUsage));
  EXPECT_THAT(outcome.err, HasSubstr("log add: MESSAGE is required"));
}

TEST_F(LogCommand, ListOfNone) {
  makeStore();
  EXPECT_EQ(run({"log", "list"}).out, "No entries.\n");
}

TEST_F(LogCommand, ListIsATableOldestFirst) {
  write({"one", "two"});
  const std::vector<std::string> shown = lines(run({"log", "list"}).out);
  ASSERT_THAT(shown, SizeIs(3));
  EXPECT_THAT(shown[0], MatchesRegex("TIME +MESSAGE"));
  EXPECT_EQ(shown[1], "1970-01-01T00:01:40Z  one");
  EXPECT_EQ(shown[2], "1970-01-01T00:03:20Z  two");
}

TEST_F(LogCommand, ListAsJson) {
  write({"one"});
  const Json::Value entry = json({"log", "list"})["entries"][0];
  EXPECT_EQ(entry["id"], Json::Value(1));
  EXPECT_EQ(entry["timestamp"], Json::Value(100));
  EXPECT_EQ(entry["time"], "1970-01-01T00:01:40Z");
  EXPECT_EQ(entry["msg"], "one");
}

TEST_F(LogCommand, ListOfTheNewest) {
  write({"one", "two", "three"});
  EXPECT_THAT(listed({"--last", "2"}), testing::ElementsAre("two", "three"));
  EXPECT_THAT(listed({"--last", "0"}), SizeIs(0));
  EXPECT_THAT(listed({"--last", "9"}), SizeIs(3));
}

TEST_F(LogCommand, ListOfMatchingEntries) {
  write({"client added", "client removed", "it's 100%"});
  EXPECT_THAT(listed({"--contains", "removed"}), testing::ElementsAre("client removed"));
  EXPECT_THAT(listed({"--contains", "c%d"}), SizeIs(2));
  EXPECT_THAT(listed({"--contains", "'"}), testing::ElementsAre("it's 100%"));
  EXPECT_THAT(listed({"--contains", "client", "--last", "1"}),
              testing::ElementsAre("client removed"));
}

TEST_F(LogCommand, ListDoesNotRunWhatItIsAskedToFind) {
  write({"one"});
  EXPECT_THAT(listed({"--contains", "x'; DELETE FROM oauth_log; --"}), SizeIs(0));
  EXPECT_EQ(rowCount("oauth_log"), "1");
}

TEST_F(LogCommand, ListWithABadCount) {
  for (const std::string count : {"-1", "x", "1;DELETE", ""}) {
    EXPECT_THAT(run({"log", "list", "--last", count}), ExitsWith(kUsage)) << count;
  }
}

TEST_F(LogCommand, ClearDeletesAllAndSaysWhoDidIt) {
  write({"one", "two"});
  EXPECT_EQ(json({"log", "clear", "--yes"})["cleared"], Json::Value(2));
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"), "Audit log cleared by [carol]");
}

TEST_F(LogCommand, ListOfATime) {
  write({"one", "two", "three"});
  EXPECT_THAT(listed({"--since", "1970-01-01T00:03:20Z"}), testing::ElementsAre("two", "three"));
  EXPECT_THAT(listed({"--until", "1970-01-01 00:03:20"}), testing::ElementsAre("one", "two"));
  EXPECT_THAT(listed({"--since", "1970-01-01T00:02", "--until", "1970-01-01T00:04"}),
              testing::ElementsAre("two"));
  EXPECT_THAT(listed({"--since", "1970-01-02"}), SizeIs(0));
}

TEST_F(LogCommand, ListOfTheLastHour) {
  write({"old"});
  ASSERT_THAT(add("new"), ExitsWith(kOk));
  EXPECT_THAT(listed({"--since", "1h"}), testing::ElementsAre("new"));
  EXPECT_THAT(listed({"--since", "1w 2d 3h4m5s"}), testing::ElementsAre("new"));
  EXPECT_THAT(listed({"--until", "1h"}), testing::ElementsAre("old"));
}

TEST_F(LogCommand, ListOfATimeThatIsNone) {
  makeStore();
  for (const std::string text : {"", "1", "h", "1x", "-1h", "1 h", "yesterday", "2026-02-30",
                                 "2026-13-01", "2026-01-01T25:00", "2026-01-01T", "26-01-01",
                                 "1969-12-31", "99999999999999999999d", "2026-01-31T08:15+01"}) {
    const Outcome outcome = run({"log", "list", "--since=" + text});
    EXPECT_THAT(outcome, ExitsWith(kUsage)) << text;
  }
}

TEST_F(LogCommand, LongEntriesGoOnInTheNextLine) {
  ::setenv("COLUMNS", "40", 1);
  write({"one two three four five"});
  EXPECT_EQ(run({"log", "list"}).out,
            "TIME                  MESSAGE\n"
            "1970-01-01T00:01:40Z  one two three four\n"
            "                      five\n");
  ::unsetenv("COLUMNS");
}

TEST_F(LogCommand, ClearOfAnEmptyLogDoesNotAsk) {
  makeStore();
  const Outcome cleared = run({"log", "clear"});
  EXPECT_THAT(cleared, ExitsWith(kOk));
  EXPECT_EQ(cleared.out, "The log is empty.\n");
}

}  // namespace
}  // namespace cli
