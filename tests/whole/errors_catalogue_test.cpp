// The catalogue of errors, its page for readers, and what the numbers are.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "core/oauth_errors.h"

namespace errors = KELDOAUTHSERVER::errors;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::Pair;

namespace {

using Errors = std::multimap<std::string, std::string>;  // message by code

std::string contentOf(const char* path) {
  std::ifstream file(path);
  EXPECT_TRUE(file) << path;
  return {std::istreambuf_iterator<char>(file), {}};
}

/// The errors that the header defines.
Errors catalogue() {
  const std::string header = contentOf("core/oauth_errors.h");
  const std::regex definition("OAUTHError k\\w+\\{(-?[0-9]+), \"([^\"]*)\"\\}");
  Errors found;
  for (auto match = std::sregex_iterator(header.begin(), header.end(), definition);
       match != std::sregex_iterator(); ++match) {
    found.emplace((*match)[1].str(), (*match)[2].str());
  }
  return found;
}

/// A row of the page's first table.
struct Documented {
  std::string code;
  std::string message;
  std::string setBy;
};

std::vector<Documented> documented() {
  const std::string page = contentOf("docs/errors.md");
  const std::string table = page.substr(0, page.find("\n## "));
  const std::regex row("\\| (-?[0-9]+|SQLite's) \\| (\"([^\"]*)\"|[^|]*) \\| ([^|\\n]*) \\|");
  std::vector<Documented> rows;
  for (auto match = std::sregex_iterator(table.begin(), table.end(), row);
       match != std::sregex_iterator(); ++match) {
    const std::string quoted = (*match)[3].str();
    const std::string message = (*match)[2].str() == "(empty)" ? "" : (*match)[2].str();
    rows.push_back({(*match)[1].str(), quoted.empty() ? message : quoted, (*match)[4].str()});
  }
  return rows;
}

TEST(ErrorsTest, HaveTheAgreedCodesAndMessages) {
  EXPECT_THAT(catalogue(),
              ::testing::UnorderedElementsAre(
                  Pair("255", ""), Pair("-1", "Create table failed"), Pair("-2", "Bad parameters"),
                  Pair("-3", "Access Token Expired"), Pair("-4", "Data Encrypt failed"),
                  Pair("-4", "Data Decrypt failed"), Pair("-5", "ClientInfo Table is full"),
                  Pair("-5", "GrantCode Table is full"), Pair("-5", "Token Table is full")));
}

TEST(ErrorsTest, AreReadAsTheCompilerReadsThem) {
  EXPECT_THAT(catalogue(), Contains(Pair(std::to_string(errors::kTokenFull.code),
                                         std::string(errors::kTokenFull.message))));
  EXPECT_THAT(catalogue(), Contains(Pair(std::to_string(errors::kNone.code), "")));
}

TEST(ErrorsTest, OfTheCatalogueAreAllDocumented) {
  Errors rows;
  for (const Documented& row : documented()) rows.emplace(row.code, row.message);
  for (const auto& error : catalogue()) EXPECT_THAT(rows, Contains(error));
}

TEST(ErrorsTest, OfThePageAreAllInTheCatalogueOrSqlites) {
  const Errors known = catalogue();
  int ofSqlite = 0;
  for (const Documented& row : documented()) {
    if (row.code == "SQLite's") {
      ++ofSqlite;
    } else if (row.code != "7") {
      EXPECT_THAT(known, Contains(Pair(row.code, row.message)));
    }
  }
  EXPECT_EQ(ofSqlite, 2);
}

TEST(ErrorsTest, OfThePageSayWhoSetsThem) {
  const auto rows = documented();
  EXPECT_EQ(rows.size(), catalogue().size() + 3);
  for (const Documented& row : rows) EXPECT_GT(row.setBy.size(), 10U) << row.message;
}

TEST(ErrorsTest, PageQuotesTheMessageOfAFailedOpening) {
  Errors rows;
  for (const Documented& row : documented()) rows.emplace(row.code, row.message);
  EXPECT_THAT(rows, Contains(Pair("SQLite's", errors::kOpenFailed)));
}

TEST(ErrorsTest, PageQuotesSqlitesTextForNoMemory) {
  Errors rows;
  for (const Documented& row : documented()) rows.emplace(row.code, row.message);
  EXPECT_THAT(rows, Contains(Pair(std::to_string(SQLITE_NOMEM), sqlite3_errstr(SQLITE_NOMEM))));
}

/// Own codes must never be taken for one of SQLite's.
TEST(ErrorsTest, AreNoResultCodesOfSqlite) {
  for (const auto& [code, message] : catalogue()) {
    EXPECT_STREQ(sqlite3_errstr(std::stoi(code)), "unknown error") << message;
  }
}

}  // namespace
