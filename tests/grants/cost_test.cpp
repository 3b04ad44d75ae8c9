// What each operation asks of SQLite: the table in docs/grants.md.

#include <sqlite3.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <sstream>

#include "stores/oauth_token.h"
#include "tests/grants/household.h"
#include "tests/stores/statements.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;

/// The rows of the table: what stands in the cells behind the operation's name.
std::map<std::string, std::string> publishedTable() {
  std::ifstream file(PROJECT_FOLDER "/docs/grants.md");
  std::map<std::string, std::string> table;
  for (std::string line; std::getline(file, line);) {
    if (line.rfind("| `", 0) != 0) continue;
    const std::size_t end = line.find('`', 3);
    const std::string name = line.substr(3, end - 3);
    if (name.find('/') == std::string::npos) table[name] = line.substr(end + 1);
  }
  return table;
}

class CostTest : public HouseholdTest {
 protected:
  /// " | opens | commits | statements |", the connection's own start left out.
  std::string costOf(const Operation& operation) {
    reset();
    if (operation.name == "VerifyForeign") storeForeign();
    Statements::watch();
    std::string cells;
    {
      Grants grants;
      Statements::clear();
      operation.run(grants, household_);
      const std::vector<std::string> texts = Statements::texts();
      const auto commits = std::count(texts.begin(), texts.end(), "COMMIT");
      cells = " | 1 | " + std::to_string(commits) + " | " + std::to_string(texts.size()) + " |";
    }
    Statements::watch();
    return cells;
  }

  void storeForeign() {
    Json::Value out;
    KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable)
        .Add("alice", household_.frame.text(), "profile", support::id64('r'), support::id64('f'),
             std::to_string(kNow + 600), "password", "state", "", out);
  }
};

TEST_F(CostTest, IsAsPublished) {
  const std::map<std::string, std::string> published = publishedTable();
  std::vector<Operation> operations = everyChange();
  for (const Operation& lookUp : everyLookUp()) operations.push_back(lookUp);
  for (const Operation& operation : operations) {
    const auto row = published.find(operation.name);
    const std::string shown = row == published.end() ? "" : row->second;
    EXPECT_EQ(shown, costOf(operation)) << "| `" << operation.name << "`" << costOf(operation);
  }
  EXPECT_EQ(published.size(), operations.size());
}

TEST_F(CostTest, AConnectionIsOpenedOnce) {
  reset();
  static int opened;
  opened = 0;
  const auto count = [](sqlite3*, char**, const sqlite3_api_routines*) {
    ++opened;
    return SQLITE_OK;
  };
  sqlite3_auto_extension(reinterpret_cast<void (*)()>(+count));
  {
    Grants grants;
    for (const Operation& operation : everyChange()) operation.run(grants, household_);
  }
  sqlite3_cancel_auto_extension(reinterpret_cast<void (*)()>(+count));
  EXPECT_EQ(opened, 1);
}

/// How SQLite finds the rows of a statement.
std::string planOf(const std::string& statement) {
  std::string plan;
  sqlite3* db = nullptr;
  sqlite3_open("/var/packages/Corvane/target/etc/oauth.db", &db);
  const auto append = [](void* text, int count, char** values, char**) {
    *static_cast<std::string*>(text) += std::string(values[count - 1]) + "\n";
    return 0;
  };
  sqlite3_exec(db, ("EXPLAIN QUERY PLAN " + statement).c_str(), append, &plan, nullptr);
  sqlite3_close(db);
  return plan;
}

TEST_F(CostTest, AVerificationLooksUpByIndex) {
  reset();
  Statements::watch();
  std::vector<std::string> texts;
  {
    Grants grants;
    Statements::clear();
    grants.tokens.verify(household_.old.access);
    texts = Statements::texts();
  }
  Statements::watch();
  ASSERT_EQ(texts.size(), 2U);
  for (const std::string& text : texts) {
    EXPECT_THAT(planOf(text), ::testing::HasSubstr("USING INDEX")) << text;
  }
}

TEST_F(CostTest, ARefreshFindsItsRowByKey) {
  reset();
  Statements::watch();
  std::vector<std::string> texts;
  {
    Grants grants;
    Statements::clear();
    grants.tokens.refresh({household_.frame, *household_.old.refresh});
    texts = Statements::texts();
  }
  Statements::watch();
  for (const std::string& text : texts) {
    EXPECT_THAT(planOf(text), ::testing::Not(::testing::HasSubstr("SCAN"))) << text;
  }
}

/// The lines of a file, without blanks at their start and without empty ones.
std::vector<std::string> linesOf(const std::string& path) {
  std::ifstream file(PROJECT_FOLDER "/" + path);
  std::vector<std::string> lines;
  for (std::string line; std::getline(file, line);) {
    const std::size_t start = line.find_first_not_of(' ');
    if (start != std::string::npos) lines.push_back(line.substr(start));
  }
  return lines;
}

TEST(ReadmeTest, ShowsTheLoginThatIsCompiled) {
  const std::vector<std::string> example = linesOf("examples/first_login.cpp");
  const auto first = std::find(example.begin(), example.end(), "Grants grants;");
  const auto last = std::find_if(first, example.end(), [](const std::string& line) {
    return line.rfind("return revoked", 0) == 0;
  });
  ASSERT_NE(last, example.end());
  const std::vector<std::string> readme = linesOf("README.md");
  EXPECT_NE(std::search(readme.begin(), readme.end(), first, last + 1), readme.end());
}

}  // namespace
}  // namespace grants_test
