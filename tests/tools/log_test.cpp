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
  EXPECT_THAT(listed({"--contains", "'"}), testing::ElementsAre("it''s 100%"));
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

TEST_F(LogCommand, ClearDeletesAll) {
  write({"one", "two"});
  EXPECT_EQ(json({"log", "clear", "--yes"})["cleared"], Json::Value(2));
  EXPECT_EQ(rowCount("oauth_log"), "0");
}

TEST_F(LogCommand, ClearOfAnEmptyLogDoesNotAsk) {
  makeStore();
  const Outcome cleared = run({"log", "clear"});
  EXPECT_THAT(cleared, ExitsWith(kOk));
  EXPECT_EQ(cleared.out, "The log is empty.\n");
}

}  // namespace
}  // namespace cli
