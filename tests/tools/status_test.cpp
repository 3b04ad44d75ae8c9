// keldoauth status.

#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <optional>

#include "tests/faults/small_medium.h"
#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::Not;
using testing::StartsWith;

class Status : public CliTest {
 protected:
  static constexpr char kKey[] = "/var/packages/Corvane/target/etc/keldcore.key";

  void SetUp() override {
    CliTest::SetUp();
    ::chmod(kStateDir, 0700);
  }
  void TearDown() override {
    EXPECT_EQ(::chown(kStateDir, ::geteuid(), ::getegid()), 0);
    CliTest::TearDown();
  }

  /// From byte `from` of a page, counted as SQLite does, to its end.
  static void damage(int page, std::size_t from) {
    std::string file = readFile(kDatabase);
    const std::size_t start = 4096 * static_cast<std::size_t>(page - 1) + from;
    file.replace(start, 4096 - from, 4096 - from, 'x');
    writeFile(kDatabase, file);
  }

  /// "subject: message" of every problem.
  static std::vector<std::string> problems(int exit = kUnhealthy) {
    std::vector<std::string> found;
    const Json::Value status = json({"status"}, "", exit);
    for (const Json::Value& problem : status["problems"]) {
      found.push_back(problem["subject"].asString() + ": " + problem["message"].asString());
    }
    return found;
  }
};

// When all is well ------------------------------------------------------------------

TEST_F(Status, OfAFreshInstallation) {
  const Json::Value status = json({"status"});
  EXPECT_THAT(problems(kOk), IsEmpty());
  EXPECT_EQ(status["database"]["ready"], Json::Value(false));
  EXPECT_EQ(status["database"]["message"], "does not exist yet; the first use creates it");
  EXPECT_FALSE(std::filesystem::exists(kDatabase)) << "status must not create it";
}

TEST_F(Status, FilesWithOwnerAndMode) {
  addClient();
  const Json::Value files = json({"status"})["files"];
  EXPECT_EQ(files["folder"]["path"], kStateDir);
  EXPECT_EQ(files["folder"]["mode"], "0700");
  EXPECT_EQ(files["database"]["path"], kDatabase);
  EXPECT_EQ(files["database"]["owner"], "root");
  EXPECT_EQ(files["database"]["group"], "root");
  EXPECT_EQ(files["database"]["mode"], "0600");
  EXPECT_EQ(files["database"]["size"].asUInt64(), std::filesystem::file_size(kDatabase));
  EXPECT_EQ(files["settings"]["exists"], Json::Value(false));
  EXPECT_EQ(files["settings"]["mode"], Json::Value());
  EXPECT_EQ(files["debug_flag"]["path"], kFlagFile);
}

TEST_F(Status, OwnersWithoutANameAreNumbers) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  addClient();
  ASSERT_EQ(::chown(kDatabase, 54321, 54322), 0);
  const Json::Value file = json({"status"})["files"]["database"];
  EXPECT_EQ(file["owner"], "54321");
  EXPECT_EQ(file["group"], "54322");
}

TEST_F(Status, RowsAgainstLimits) {
  writeSettings(R"({"client_info_max": 50, "log_max": 70})");
  addClient();
  issueCode();
  issueCode();
  issueToken();
  expireIn("oauth_grantCode", 1, -5);
  const Json::Value tables = json({"status"})["database"]["tables"];
  ASSERT_EQ(tables.size(), 4U);
  EXPECT_EQ(tables[0]["name"], "oauth_clientInfo");
  EXPECT_EQ(tables[0]["rows"], Json::Value(1));
  EXPECT_EQ(tables[0]["limit"], Json::Value(50));
  EXPECT_EQ(tables[0]["limit_key"], "client_info_max");
  EXPECT_EQ(tables[0]["expired"], Json::Value());
  EXPECT_EQ(tables[1]["rows"], Json::Value(2));
  EXPECT_EQ(tables[1]["expired"], Json::Value(1));
  EXPECT_EQ(tables[2]["rows"], Json::Value(1));
  EXPECT_EQ(tables[2]["expired"], Json::Value(0));
  EXPECT_EQ(tables[3]["limit"], Json::Value(70));
}

TEST_F(Status, SaysWhatTheNumbersMean) {
  addClient();
  issueToken();
  expireIn("oauth_token", 1, -3600);
  ASSERT_THAT(run({"code", "redeem"}, issueCode()["code"].asString()), ExitsWith(kOk));
  const Json::Value tables = json({"status"})["database"]["tables"];
  EXPECT_EQ(tables[1]["redeemed"], Json::Value(1));
  EXPECT_EQ(tables[1]["expired"], Json::Value(0));
  EXPECT_EQ(tables[2]["expired"], Json::Value(0)) << "it can still be refreshed";
  EXPECT_THAT(run({"status"}).out,
              HasSubstr("1 redeemed code is kept to notice when one comes again.\n"));
}

TEST_F(Status, DeadRowsDoNotMakeATableFull) {
  addClient();
  issueCode();
  multiply("oauth_grantCode", 10);
  writeSettings(R"({"grantcode_max": 10})");
  EXPECT_THAT(problems(), ElementsAre("oauth_grantCode: full (10 of 10 rows)"));
  sql("UPDATE oauth_grantCode SET expired_time='5' WHERE id>2");
  EXPECT_THAT(problems(kOk), IsEmpty());
}

TEST_F(Status, Lifetimes) {
  writeSettings(R"({"grantcode_expired": 90, "token_expired": 7200})");
  const Json::Value lifetimes = json({"status"})["lifetimes"];
  EXPECT_EQ(lifetimes["grantcode_expired"], Json::Value(90));
  EXPECT_EQ(lifetimes["token_expired"], Json::Value(7200));
  EXPECT_THAT(run({"status"}).out, HasSubstr("Lifetimes    codes 1m 30s, access tokens 2h\n"));
}

TEST_F(Status, DiagnosticsInWords) {
  writeSettings(R"({"log_level": 9})");
  const Json::Value diagnostics = json({"status"})["diagnostics"];
  EXPECT_EQ(diagnostics["debug_flag"], Json::Value(false));
  EXPECT_EQ(diagnostics["log_level"], Json::Value(9));
  EXPECT_EQ(diagnostics["log_classes"][0], "store operations");
  EXPECT_EQ(diagnostics["log_classes"][1], "SQL statements");
  EXPECT_EQ(diagnostics["log_classes"].size(), 2U);
  EXPECT_THAT(run({"status"}).out,
              HasSubstr("Diagnostics  off, log level 9: store operations, SQL statements\n"));
}

TEST_F(Status, ForPeople) {
  addClient();
  const Outcome status = run({"status"});
  EXPECT_THAT(status, ExitsWith(kOk));
  EXPECT_THAT(status.out, HasSubstr("/oauth.db   root:root  0600  "));
  EXPECT_THAT(status.out, HasSubstr("/oauth.cfg  absent     -     -\n"));
  EXPECT_THAT(status.out, HasSubstr("oauth_clientInfo  1     -        1000 (client_info_max)\n"));
  EXPECT_THAT(status.out, HasSubstr("\nNothing is wrong.\n"));
}

TEST_F(Status, GoodSettingsAreNoProblem) {
  writeSettings(R"({"grantcode_expired": 1, "token_expired": 2147483647, "client_info_max": 10000,
                    "grantcode_max": 1, "token_max": 9999, "log_max": 5, "log_level": 15})");
  EXPECT_THAT(problems(kOk), IsEmpty());
}

TEST_F(Status, AFullLogIsNoProblem) {
  writeSettings(R"({"log_max": 1})");
  addClient();
  EXPECT_EQ(rowCount("oauth_log"), "1");
  EXPECT_THAT(problems(kOk), IsEmpty());
}

// Settings --------------------------------------------------------------------------

struct BadSettings {
  const char* what;
  const char* text;
  const char* problem;
};

class StatusOfSettings : public Status, public testing::WithParamInterface<BadSettings> {};

TEST_P(StatusOfSettings, NamesWhatIsWrong) {
  writeSettings(GetParam().text);
  EXPECT_THAT(problems(), ElementsAre(std::string("settings: ") + GetParam().problem));
}

INSTANTIATE_TEST_SUITE_P(
    Files, StatusOfSettings,
    testing::Values(
        BadSettings{"Empty", "",
                    "is not JSON: Line 1, Column 1 Syntax error: value, object or "
                    "array expected."},
        BadSettings{"Truncated", "{\"token_max\": 5,",
                    "is not JSON: Line 1, Column 17 Missing '}' or object member name"},
        BadSettings{"AnArray", "[1]", "is not a JSON object"},
        BadSettings{"UnknownKey", "{\"token_maximum\": 5}", "unknown key token_maximum"},
        BadSettings{"HostileKey", "{\"a\\u001b[2J\": 5}", "unknown key a\\x1b[2J"},
        BadSettings{"Text", "{\"token_max\": \"500\"}",
                    "token_max: \"500\" is not a 32-bit integer"},
        BadSettings{"Real", "{\"token_expired\": 600.5}",
                    "token_expired: 600.5 is not a 32-bit integer"},
        BadSettings{"Boolean", "{\"log_max\": true}", "log_max: true is not a 32-bit integer"},
        BadSettings{"Null", "{\"log_max\": null}", "log_max: null is not a 32-bit integer"},
        BadSettings{"Object", "{\"log_max\": {}}", "log_max: an object is not a 32-bit integer"},
        BadSettings{"Huge", "{\"token_max\": 3000000000}",
                    "token_max: 3000000000 is not a 32-bit integer"},
        BadSettings{"AboveTheCap", "{\"token_max\": 10001}", "token_max: 10001 is out of range"},
        BadSettings{"Zero", "{\"grantcode_expired\": 0}", "grantcode_expired: 0 is out of range"},
        BadSettings{"Negative", "{\"client_info_max\": -5}", "client_info_max: -5 is out of range"},
        BadSettings{"UnknownLogClass", "{\"log_level\": 16}",
                    "log_level: 16 has bits without a meaning"}),
    [](const auto& test) { return test.param.what; });

TEST_F(Status, SaysWhatAppliesInstead) {
  writeSettings(R"({"token_max": 20000})");
  const Json::Value problem = json({"status"}, "", kUnhealthy)["problems"][0];
  EXPECT_EQ(problem["hint"], "10000 applies");
  EXPECT_THAT(run({"status"}).out, HasSubstr("\nWrong:\n  settings: token_max: 20000 is out of "
                                             "range\n      10000 applies\n"));
}

TEST_F(Status, DeeplyNestedSettings) {
  writeSettings(std::string(5000, '['));
  EXPECT_THAT(problems(), ElementsAre(HasSubstr("settings: is not JSON: ")));
}

TEST_F(Status, SettingsThatAreAFolder) {
  std::filesystem::create_directory(kSettings);
  EXPECT_THAT(problems(), ElementsAre("settings: is not a regular file"));
  std::filesystem::remove(kSettings);
}

TEST_F(Status, SettingsThatAreAPipeDoNotKeepItWaiting) {
  ASSERT_EQ(::mkfifo(kSettings, 0600), 0);
  EXPECT_THAT(problems(), ElementsAre("settings: is not a regular file"));
}

// Files -----------------------------------------------------------------------------

TEST_F(Status, FilesThatAreOpenToOthers) {
  addClient();
  writeSettings("{}");
  ::chmod(kStateDir, 0770);
  ::chmod(kDatabase, 0640);
  ::chmod(kSettings, 0666);
  EXPECT_THAT(problems(),
              ElementsAre("folder: can be written by more than its owner (mode 0770)",
                          "database: is open to more than its owner (mode 0640)",
                          "settings: can be written by more than its owner (mode 0666)"));
}

TEST_F(Status, DiagnosticsThatWriteSecrets) {
  writeFile(kFlagFile, "");
  for (const int level : {2, 4, 8}) {
    writeSettings("{\"log_level\": " + std::to_string(level) + "}");
    EXPECT_THAT(problems(),
                ElementsAre("diagnostics: secrets and tokens are written to the system log"));
  }
  writeSettings(R"({"log_level": 1})");
  EXPECT_THAT(problems(kOk), IsEmpty());
}

// Database --------------------------------------------------------------------------

TEST_F(Status, TablesNearTheirLimit) {
  addClient();
  issueCode();
  multiply("oauth_grantCode", 9);
  writeSettings(R"({"grantcode_max": 10, "client_info_max": 1})");
  EXPECT_THAT(problems(), ElementsAre("oauth_clientInfo: full (1 of 1 rows)",
                                      "oauth_grantCode: nearly full (9 of 10 rows)"));
  sql("DELETE FROM oauth_grantCode WHERE id>8");
  EXPECT_THAT(problems(), ElementsAre("oauth_clientInfo: full (1 of 1 rows)"));
}

TEST_F(Status, ADatabaseThatIsNone) {
  writeFile(kDatabase, std::string(4096, 'x'));
  ::chmod(kDatabase, 0600);
  const Json::Value database = json({"status"}, "", kUnhealthy)["database"];
  EXPECT_EQ(database["ready"], Json::Value(false));
  EXPECT_EQ(database["code"], Json::Value(26));
  EXPECT_EQ(database["message"], "file is not a database");
  EXPECT_THAT(problems(), ElementsAre("database: not ready: "
                                      "file is not a database (26)"));
  EXPECT_THAT(run({"status"}).out, HasSubstr("\nDatabase     file is not a database\n"));
}

TEST_F(Status, AMalformedSchema) {
  addClient();
  damage(1, 100);
  EXPECT_THAT(problems(), ElementsAre(MatchesRegex("database: not ready: .*malformed.* \\(11\\)")));
}

TEST_F(Status, AMalformedPageThatNoCountReads) {
  addClient();
  issueCode();
  multiply("oauth_grantCode", 40);
  const int page = std::stoi(sqlText(
      "SELECT pageno FROM dbstat WHERE name='oauth_grantCode' AND pagetype='leaf' LIMIT 1"));
  damage(page, 0);
  const std::vector<std::string> found = problems();
  EXPECT_THAT(found, Contains("tables: cannot be read: database disk image is malformed (11)"));
  EXPECT_THAT(found, Contains(MatchesRegex("database: is malformed: [^\n]*")));
}

TEST_F(Status, ADamagedIndexThatNobodyReads) {
  addClient();
  for (int row = 0; row < 3; ++row) issueCode();
  const int page = std::stoi(
      sqlText("SELECT rootpage FROM sqlite_master WHERE tbl_name='oauth_token' AND type='index'"));
  damage(page, 0);
  EXPECT_THAT(problems(), Contains(MatchesRegex("database: is malformed: .*")));
}

TEST_F(Status, TriggersAndViews) {
  addClient();
  sql("CREATE VIEW peep AS SELECT * FROM oauth_token;"
      "CREATE TRIGGER \"copy\x7f\" AFTER INSERT ON oauth_token BEGIN SELECT 1; END");
  EXPECT_THAT(problems(),
              ElementsAre("database: has a trigger copy\x7f", "database: has a view peep"));
  EXPECT_THAT(run({"status"}).out, HasSubstr("database: has a trigger copy\\x7f\n"));
}

TEST_F(Status, AnotherProgramsDatabase) {
  sql("CREATE TABLE recipes(name)");
  ::chmod(kDatabase, 0600);
  EXPECT_THAT(problems(), ElementsAre("database: has none of the store's tables: it is another "
                                      "program's, or was emptied"));
  EXPECT_EQ(json({"status"}, "", kUnhealthy)["database"]["message"],
            "is empty; the first use creates its tables");
}

TEST_F(Status, ADatabaseThatIsJustBeingMade) {
  writeFile(kDatabase, "");
  ::chmod(kDatabase, 0600);
  EXPECT_THAT(problems(kOk), IsEmpty());
  EXPECT_EQ(readFile(kDatabase), "");
}

TEST_F(Status, ATableThatCannotBeRead) {
  addClient();
  sql("DROP TABLE oauth_token; CREATE VIEW oauth_token AS SELECT * FROM missing");
  EXPECT_THAT(problems(),
              Contains(MatchesRegex("tables: cannot be read: no such table.*missing \\(1\\)")));
  EXPECT_EQ(json({"status"}, "", kUnhealthy)["database"]["tables"][2]["rows"], Json::Value());
}

TEST_F(Status, ClientsOfAnotherKey) {
  addClient();
  sql("UPDATE oauth_clientInfo SET client_id='x' || client_id");
  EXPECT_THAT(problems(), ElementsAre("oauth_clientInfo: 1 identifier cannot be decrypted"));
}

TEST_F(Status, ACipherThatFails) {
  addClient();
  ::chmod("/var/packages/Corvane/target/etc/keldcore.key", 0644);
  EXPECT_THAT(problems(), Contains("cipher: cannot encrypt (-4)"));
}

TEST_F(Status, AnInterruptedChangeOfTheKey) {
  const std::string waiting = "/var/packages/Corvane/target/etc/keldcore.key.next";
  std::ofstream(waiting) << "key";
  EXPECT_THAT(problems(),
              ElementsAre("key: a change of it was interrupted: " + waiting + " waits"));
}

TEST_F(Status, AMissingKey) {
  addClient();
  std::filesystem::remove(kKey);
  EXPECT_THAT(problems(), ElementsAre(std::string("key: ") + kKey + " is missing"));
  EXPECT_FALSE(std::filesystem::exists(kKey));
}

TEST_F(Status, AMissingKeyOfAnEmptyStore) {
  run({"log", "add", "entry"});
  EXPECT_THAT(problems(kOk), IsEmpty());
  EXPECT_FALSE(std::filesystem::exists(kKey));
}

TEST_F(Status, KeyFilesThatAreLeftOver) {
  addClient();
  std::ofstream(std::string(kKey) + ".a1B2c3") << "key";
  std::ofstream(std::string(kKey) + ".next.\x7f") << "key";
  EXPECT_THAT(problems(), ElementsAre(std::string("key: left over: ") + kKey + ".a1B2c3",
                                      std::string("key: left over: ") + kKey + ".next.\x7f"));
  EXPECT_THAT(run({"status"}).out, HasSubstr(".next.\\x7f\n"));
}

TEST_F(Status, AJournalOfAnotherUser) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  const std::string journal = std::string(kDatabase) + "-journal";
  addClient();
  std::ofstream(journal) << "";
  EXPECT_THAT(problems(kOk), IsEmpty());
  std::ofstream(journal) << "";
  ASSERT_EQ(::chown(journal.c_str(), kNobody, kNobody), 0);
  EXPECT_THAT(problems(),
              ElementsAre("journal: " + journal + " belongs to nobody, the folder to root"));
}

TEST_F(Status, AJournalOfTheFoldersOwnerBesideRootsDatabase) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  const std::string journal = std::string(kDatabase) + "-journal";
  addClient();
  std::ofstream(journal) << "";
  ASSERT_EQ(::chown(journal.c_str(), kNobody, kNobody), 0);
  ASSERT_EQ(::chown(kStateDir, kNobody, kNobody), 0);
  EXPECT_THAT(problems(kOk), IsEmpty());
}

TEST_F(Status, RoomOnTheDisk) {
  addClient();
  const Json::Value disk = json({"status"})["disk"];
  EXPECT_GT(disk["needed"].asUInt64(), std::filesystem::file_size(kDatabase));
  EXPECT_GT(disk["free"].asUInt64(), disk["needed"].asUInt64());
}

TEST_F(Status, AMissingFolder) {
  const HiddenFolder hidden;
  EXPECT_THAT(problems(), ElementsAre("folder: cannot be reached: No such file or directory"));
  const Json::Value status = json({"status"}, "", kUnhealthy);
  EXPECT_EQ(status["files"]["folder"]["exists"], Json::Value(false));
  EXPECT_EQ(status["database"]["message"], "does not exist");
}

TEST_F(Status, AFolderThatCannotBeWritten) {
  addClient();
  const ReadOnlyFolder readOnly;
  EXPECT_THAT(problems(),
              Contains("folder: cannot be written by user root: Read-only file system"));
}

TEST_F(Status, AnotherUser) {
  if (!canBecomeNobody()) GTEST_SKIP() << "no other user in this namespace";
  addClient();
  const Outcome status = runAsNobody({"status"});
  EXPECT_THAT(status, ExitsWith(kUnhealthy));
  EXPECT_THAT(status.out, HasSubstr("/oauth.db   Permission denied  -     -\n"));
  EXPECT_THAT(status.out, HasSubstr("folder: cannot be written by user nobody: Permission denied"));
  EXPECT_THAT(status.out, HasSubstr("settings: cannot be read: Permission denied"));
  EXPECT_THAT(status.out, HasSubstr("database: not ready: Open DB failed!! (14)"));
  EXPECT_THAT(status.out, Not(HasSubstr("does not exist")));
}

// Disk ------------------------------------------------------------------------------

/// A store with 200 expired tokens, on a small disk of its own.
class StatusOfASmallDisk : public Status {
 protected:
  void SetUp() override {
    Status::SetUp();
    medium_.emplace(kStateDir);
    ::chmod(kStateDir, 0700);
    addClient();
    issueToken();
    sql("UPDATE oauth_token SET expired_time='5'");
    multiply("oauth_token", 200);
  }
  void TearDown() override {
    medium_.reset();
    Status::TearDown();
  }

  /// Room for as much as status says.
  int pagesNeeded() {
    const auto needed = json({"status"})["disk"]["needed"].asUInt64();
    return static_cast<int>((needed + 4095) / 4096);
  }

  std::optional<faults::SmallMedium> medium_;
};

TEST_F(StatusOfASmallDisk, WithRoomForAPurge) {
  medium_->fill(pagesNeeded());
  EXPECT_THAT(problems(kOk), IsEmpty());
  EXPECT_THAT(run({"token", "purge", "--yes"}), ExitsWith(kOk));
  EXPECT_EQ(rowCount("oauth_token"), "0");
}

TEST_F(StatusOfASmallDisk, WithoutRoomForAPurge) {
  medium_->fill(pagesNeeded() - 1);
  EXPECT_THAT(
      problems(),
      ElementsAre(MatchesRegex("disk: [0-9]+ bytes are free, and a purge may need [0-9]+")));
}

TEST_F(StatusOfASmallDisk, Full) {
  medium_->fill(0);
  EXPECT_THAT(problems(), Contains(StartsWith("disk: 0 bytes are free, ")));
  EXPECT_THAT(run({"token", "purge", "--yes"}).err, HasSubstr(" (13)\nhint: the disk is full\n"));
}

}  // namespace
}  // namespace cli
