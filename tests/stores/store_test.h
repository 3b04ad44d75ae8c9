// What the tests of the stores share: a world with a readable cipher, and one
// call of an operation with everything that came of it.

#ifndef KELDOAUTH_TESTS_STORES_STORE_TEST_H
#define KELDOAUTH_TESTS_STORES_STORE_TEST_H

#include <json/value.h>

#include <string>
#include <vector>

#include "core/oauth_db_basic.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/stores/statements.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

using Lines = std::vector<std::string>;

/// What an operation left behind, besides rows.
struct Aftermath {
  bool ok = false;
  int code = 0;
  std::string message;
  Lines lines;       // see journal()
  Lines statements;  // see Statements
};

/// The error that an object carries before each operation, to see who sets one.
constexpr int kCodeBefore = 42;
constexpr char kMessageBefore[] = "before";

/// What the system log holds: "oauth_token:52 ==> Add" for the stores, whose
/// lines have fixed numbers; "oauth_db_basic Add failed[oauth_token]" where the
/// number is free. A priority other than 3 stands before it, as in "<38>".
Lines journal();

/// The lines of the journal that begin with `source`.
Lines journalOf(const std::string& source);

/// An operation on `store`, whose error is set to the one before.
template <typename Store, typename Operation>
Aftermath runOn(Store& store, Operation operation) {
  store.SetErrCode(kCodeBefore);
  store.SetErrMsg(kMessageBefore);
  support::SystemLog::clear();
  Statements::clear();
  Aftermath outcome;
  outcome.ok = static_cast<bool>(operation(store));
  outcome.lines = journal();
  outcome.statements = Statements::texts();
  outcome.code = store.GetErrCode();
  outcome.message = store.GetErrMsg();
  return outcome;
}

/// The same on an object that is made for it.
template <typename Store, typename Operation>
Aftermath run(const char* table, Operation operation) {
  Store store(table);
  return runOn(store, operation);
}
template <typename Operation>
Aftermath onClients(Operation operation) {
  return run<KELDOAUTHSERVER::OAUTHDBClientInfo>(KELDOAUTHSERVER::names::kClientInfoTable,
                                                 operation);
}
template <typename Operation>
Aftermath onCodes(Operation operation) {
  return run<KELDOAUTHSERVER::OAUTHDBGrantCode>(KELDOAUTHSERVER::names::kGrantCodeTable, operation);
}
template <typename Operation>
Aftermath onTokens(Operation operation) {
  return run<KELDOAUTHSERVER::OAUTHDBToken>(KELDOAUTHSERVER::names::kTokenTable, operation);
}
template <typename Operation>
Aftermath onLog(Operation operation) {
  return run<KELDOAUTHSERVER::OAUTHDBLog>(KELDOAUTHSERVER::names::kLogTable, operation);
}

/// Success that leaves the object's error as it was.
::testing::AssertionResult succeeded(const Aftermath& outcome);
/// Failure with this error.
::testing::AssertionResult failed(const Aftermath& outcome, int code, const std::string& message);
/// Failure that leaves the object's error as it was.
::testing::AssertionResult failedSilently(const Aftermath& outcome);

/// What the file holds in place of a client's identifier or secret.
std::string cipher(const std::string& text);

class StoreTest : public support::World {
 protected:
  /// A database with its tables, all of them empty.
  void SetUp() override;
  void TearDown() override;

  static void insertClient(const support::Row& columns = {});
  static void insertCode(const support::Row& columns = {});
  static void insertToken(const support::Row& columns = {});
  static void insertLog(const support::Row& columns = {});
  /// The statements behind them.
  static std::string insertionOfClient(const support::Row& columns = {});
  static std::string insertionOfCode(const support::Row& columns = {});
  static std::string insertionOfToken(const support::Row& columns = {});
  static std::string insertionOfLog(const support::Row& columns = {});

  /// The one row of the table, and all of them in the order of their ids.
  static support::Row onlyRow(const std::string& table);
  static std::vector<support::Row> rows(const std::string& table);
  /// The values of the column "id", in order.
  static Lines ids(const std::string& table);
  static int rowCount(const std::string& table);

  /// The schema, and every row of every table but the one named.
  static std::vector<support::Row> everythingBut(const std::string& exceptTable,
                                                 const std::string& exceptId);
  static std::vector<support::Row> everything();
};

#endif  // KELDOAUTH_TESTS_STORES_STORE_TEST_H
