#include "tests/load/crowd.h"

#include <algorithm>
#include <iterator>

#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/load/processes.h"
#include "tests/load/visitor.h"
#include "tests/support/long_form.h"
#include "utils/oauth_names.h"

namespace load {

namespace names = KELDOAUTHSERVER::names;
using ::testing::IsEmpty;

namespace {

std::string ledgerFile(int number) {
  return "/tmp/ledger." + std::to_string(number);
}

std::set<std::string> without(const std::set<std::string>& rows,
                              const std::set<std::string>& known) {
  std::set<std::string> rest;
  std::set_difference(rows.begin(), rows.end(), known.begin(), known.end(),
                      std::inserter(rest, rest.end()));
  return rest;
}

}  // namespace

Size fewBusyProcesses() {
  return support::isLongForm() ? Size{8, 500} : Size{8, 20};
}

Size manyProcesses() {
  return support::isLongForm() ? Size{32, 50} : Size{16, 6};
}

/// A busy machine may take longer over a long form than the usual lifetimes, and
/// what was acknowledged must still be there then.
void Crowd::SetUp() {
  World::SetUp();
  writeSettings(R"({"client_info_max": 10000, "grantcode_max": 10000,
                    "token_max": 10000, "log_max": 10000,
                    "grantcode_expired": 86400, "token_expired": 86400})");
}

Ledger Crowd::visit(Size size) {
  const auto life = [&size](int number) {
    Visitor visitor(number, number == 0);
    visitor.visit(size.rounds);
    visitor.ledger().save(ledgerFile(number));
  };
  EXPECT_TRUE(runProcesses(size.processes, life));

  Ledger all;
  for (int number = 0; number < size.processes; ++number) all += Ledger::load(ledgerFile(number));
  EXPECT_EQ(all.rounds, size.processes * size.rounds);
  return all;
}

void Crowd::expectAsAcknowledged(const Ledger& ledger) {
  EXPECT_TRUE(KELDOAUTHSERVER::OAUTHDBGrantCode(names::kGrantCodeTable).Purge());
  EXPECT_TRUE(KELDOAUTHSERVER::OAUTHDBToken(names::kTokenTable).Purge());

  std::set<std::string> present;
  for (const support::Row& row :
       sql("SELECT 'oauth_clientInfo ' || display_name AS row FROM oauth_clientInfo UNION ALL "
           "SELECT 'oauth_grantCode ' || code FROM oauth_grantCode UNION ALL "
           "SELECT 'oauth_token ' || access_token FROM oauth_token")) {
    EXPECT_TRUE(present.insert(row.at("row")).second) << "twice: " << row.at("row");
  }
  EXPECT_THAT(without(ledger.rows, present), IsEmpty()) << "acknowledged, but not there";
  EXPECT_THAT(without(present, ledger.rows), IsEmpty()) << "there, but not acknowledged";
  EXPECT_EQ(sqlText("PRAGMA integrity_check"), "ok");
}

void Crowd::expectAuditComplete() {
  EXPECT_THAT(sql("SELECT 'Application registed[' || display_name || ']' FROM oauth_clientInfo "
                  "EXCEPT SELECT msg FROM oauth_log"),
              IsEmpty());
  EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_log"),
            sqlText("SELECT count(*) FROM oauth_clientInfo"));
}

void Crowd::report(const Ledger& ledger) {
  RecordProperty("calls", ledger.calls);
  RecordProperty("failed_calls", ledger.failedCalls);
  RecordProperty("rounds", ledger.rounds);
  RecordProperty("failed_rounds", ledger.failedRounds);
}

}  // namespace load
