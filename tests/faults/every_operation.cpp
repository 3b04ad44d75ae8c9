#include "tests/faults/every_operation.h"

#include <sqlite3.h>

#include <array>
#include <filesystem>
#include <fstream>
#include <optional>
#include <type_traits>
#include <utility>

#include "core/oauth_errors.h"
#include "core/transaction.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/allocations.h"
#include "tests/support/doubles.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace faults {

namespace fs = std::filesystem;
using namespace KELDOAUTHSERVER;
using support::Clock;
using support::id64;

namespace {

/// What the operations are called with. Built before memory runs out: from then
/// on every allocation is the library's.
struct Arguments {
  std::string a = id64('a');
  std::string b = id64('b');
  std::string c = id64('c');
  std::string d = id64('d');
  std::string second = id64('2');
  std::string eighth = id64('8');
  std::string ninth = id64('9');
  std::string secondRefresh = std::string(63, 'f') + '2';
  std::string address = "https://new.example/back";
  std::string user = "it's me";
  std::string scope = "read, and it's all";
  std::string name = "It's new";
  std::string enabled = "1";
  std::string expiry = "1700000600";
  std::string state = "that's the state";
  std::string flow = "authorization_code";
  std::string ip4 = "192.0.2.1";
  std::string ip6 = "2001:db8:ffff:ffff::1";
  std::string message = "it's noted, and at some length";
  std::string filter = "entry";
  std::string order = "ORDER BY id ASC LIMIT 100";
};

const Arguments& with() {
  static const Arguments arguments;
  return arguments;
}

template <typename Store>
const std::string& tableOf() {
  static const std::string table = [] {
    if constexpr (std::is_same_v<Store, OAUTHDBClientInfo>) return names::kClientInfoTable;
    if constexpr (std::is_same_v<Store, OAUTHDBGrantCode>) return names::kGrantCodeTable;
    if constexpr (std::is_same_v<Store, OAUTHDBToken>) return names::kTokenTable;
    if constexpr (std::is_same_v<Store, OAUTHDBLog>) return names::kLogTable;
  }();
  return table;
}

/// The room for an object is the caller's; what it needs inside is not.
template <typename Store>
std::shared_ptr<OAUTHDBBasic> openStore() {
  std::shared_ptr<std::optional<Store>> room;
  {
    const support::Uncounted ours;
    room = std::make_shared<std::optional<Store>>();
  }
  Store& store = room->emplace(tableOf<Store>());
  return {room, &store};
}

/// A text of its own for each way in which a document can differ.
std::string textOf(const Json::Value& document) {
  const support::Uncounted ours;
  return document.toStyledString();
}

// Forms of operations ---------------------------------------------------------

Operation construction(const char* name, Household household, int units) {
  return {name, household, openStore<OAUTHDBClientInfo>, nullptr, units, units};
}

/// `body(store)` is true when the store reports success.
template <typename Store, typename Body>
Operation change(const char* name, int units, Body body) {
  const auto run = [body](OAUTHDBBasic& store) {
    return Answer{static_cast<bool>(body(static_cast<Store&>(store))), ""};
  };
  return {name, Household::kComplete, openStore<Store>, run, units, units};
}

/// `body(store, rows)` likewise; what it read is its answer.
template <typename Store, typename Body>
Operation lookUp(const char* name, Body body) {
  const auto run = [body](OAUTHDBBasic& store) {
    Json::Value rows;
    const auto success = static_cast<bool>(body(static_cast<Store&>(store), rows));
    return Answer{success, success ? textOf(rows) : ""};
  };
  return {name, Household::kComplete, openStore<Store>, run, 0, 0};
}

/// A row and what follows from it: success promises the row.
Operation rowFirst(Operation operation) {
  operation.promised = 1;
  return operation;
}

Operation drawing(Operation operation) {
  operation.draws = true;
  return operation;
}

Operation purging(Operation operation) {
  operation.purges = true;
  return operation;
}

/// The same when only the first of the expired rows has expired yet.
template <typename Store>
Operation purgeOne(const char* name) {
  return purging(change<Store>(name, 1, [](Store& store) {
    Clock::setTo(kNow - 25);
    return store.Purge();
  }));
}

template <typename Store>
Operation purgeThree(const char* name) {
  return purging(change<Store>(name, 1, [](Store& store) { return store.Purge(); }));
}

// The operations --------------------------------------------------------------

std::vector<Operation> constructions() {
  return {
      construction("ConstructOnAbsentFile", Household::kAbsent, 8),
      construction("ConstructOnExistingFile", Household::kComplete, 0),
      construction("ConstructOnHotJournal", Household::kWithHotJournal, 0),
      construction("ConstructWithoutLogTable", Household::kWithoutLogTable, 1),
      construction("ConstructWithoutMetaTable", Household::kWithoutMetaTable, 4),
  };
}

std::vector<Operation> coreOperations() {
  using Store = OAUTHDBToken;
  return {
      change<Store>("DropTable", 1, [](Store& store) { return store.DBDrop(); }),
      lookUp<Store>("CountRows",
                    [](Store& store, Json::Value& rows) { return store.DBGetRowCount(rows); }),
  };
}

std::vector<Operation> registrations() {
  using Store = OAUTHDBClientInfo;
  const auto full = [](Store& store) {
    Json::Value out;
    return store.Add(with().c, with().d, with().address, with().scope, with().name, with().enabled,
                     out);
  };
  const auto generated = [](Store& store) {
    Json::Value out;
    return store.Add(with().address, with().scope, with().name, out);
  };
  const auto withSecret = [](Store& store) {
    Json::Value out;
    return store.Add(with().d, with().address, with().scope, with().name, out);
  };
  return {
      rowFirst(change<Store>("RegisterClient", 2, full)),
      drawing(rowFirst(change<Store>("RegisterGeneratedClient", 2, generated))),
      drawing(rowFirst(change<Store>("RegisterClientWithSecret", 2, withSecret))),
  };
}

std::vector<Operation> clientChanges() {
  using Store = OAUTHDBClientInfo;
  const auto edit = [](Store& store) {
    return store.Edit(1, with().address, with().scope, with().name);
  };
  return {
      change<Store>("EditClient", 1, edit),
      change<Store>("EnableClient", 1, [](Store& store) { return store.Enable(2); }),
      change<Store>("DisableClient", 1, [](Store& store) { return store.Disable(1); }),
      change<Store>("DeleteClient", 1, [](Store& store) { return store.Del(1); }),
  };
}

std::vector<Operation> clientLookUps() {
  using Store = OAUTHDBClientInfo;
  const auto index = [](Store& store, Json::Value& found) {
    found = store.GetIndex(with().b);
    return found != 0;
  };
  return {
      lookUp<Store>("GetClient",
                    [](Store& store, auto& rows) { return store.Get(with().a, &rows); }),
      lookUp<Store>("GetClientIndex", index),
      lookUp<Store>("GetClientById", [](Store& store, auto& rows) { return store.Get(2, &rows); }),
      lookUp<Store>("GetEveryClient", [](Store& store, auto& rows) { return store.Get(&rows); }),
  };
}

std::vector<Operation> codeChanges() {
  using Store = OAUTHDBGrantCode;
  const auto full = [](Store& store) {
    Json::Value out;
    return store.Add(with().user, with().a, with().scope, with().ninth, with().expiry, with().state,
                     with().ip4, out);
  };
  const auto generated = [](Store& store) {
    Json::Value out;
    return store.Add(with().user, with().a, with().scope, with().state, with().ip6, out);
  };
  const auto edit = [](Store& store) {
    return store.Edit(2, with().user, with().b, with().scope, with().state);
  };
  const auto editWithExpiry = [](Store& store) {
    return store.Edit(2, with().user, with().b, with().scope, with().expiry, with().state);
  };
  return {
      change<Store>("IssueCode", 1, full),
      drawing(change<Store>("IssueGeneratedCode", 1, generated)),
      change<Store>("EditCode", 1, edit),
      change<Store>("EditCodeWithExpiry", 1, editWithExpiry),
      change<Store>("RevokeCode", 1, [](Store& store) { return store.Revoke(2); }),
      change<Store>("DeleteCode", 1, [](Store& store) { return store.Del(2); }),
      purgeThree<Store>("PurgeThreeCodes"),
      purgeOne<Store>("PurgeOneCode"),
  };
}

std::vector<Operation> codeLookUps() {
  using Store = OAUTHDBGrantCode;
  const auto index = [](Store& store, Json::Value& found) {
    found = store.GetIndex(with().second);
    return found != 0;
  };
  return {
      lookUp<Store>("GetCode",
                    [](Store& store, auto& rows) { return store.Get(with().second, &rows); }),
      lookUp<Store>("GetCodeIndex", index),
      lookUp<Store>("GetCodeById", [](Store& store, auto& rows) { return store.Get(2, &rows); }),
      lookUp<Store>("GetEveryCode", [](Store& store, auto& rows) { return store.Get(&rows); }),
  };
}

std::vector<Operation> tokenChanges() {
  using Store = OAUTHDBToken;
  const auto full = [](Store& store) {
    Json::Value out;
    return store.Add(with().user, with().a, with().scope, with().eighth, with().ninth,
                     with().expiry, with().flow, with().state, with().ip4, out);
  };
  const auto generated = [](Store& store) {
    Json::Value out;
    return store.Add(with().user, with().a, with().scope, with().flow, with().state, with().ip6,
                     out);
  };
  const auto edit = [](Store& store) {
    return store.Edit(2, with().user, with().b, with().scope, with().flow, with().state);
  };
  const auto editWithExpiry = [](Store& store) {
    return store.Edit(2, with().user, with().b, with().scope, with().expiry, with().flow,
                      with().state);
  };
  return {
      change<Store>("StoreToken", 1, full),
      drawing(change<Store>("IssueToken", 1, generated)),
      change<Store>("EditToken", 1, edit),
      change<Store>("EditTokenWithExpiry", 1, editWithExpiry),
      change<Store>("DeleteToken", 1, [](Store& store) { return store.Del(2); }),
      change<Store>("RevokeToken", 1, [](Store& store) { return store.Revoke(2); }),
      purgeThree<Store>("PurgeThreeTokens"),
      purgeOne<Store>("PurgeOneToken"),
  };
}

/// A code for tokens, as one, on the connection of the codes.
std::vector<Operation> transactions() {
  using Store = OAUTHDBGrantCode;
  const auto redeem = [](Store& codes) {
    OAUTHDBToken tokens(tableOf<OAUTHDBToken>(), codes);
    Transaction transaction(codes);
    Json::Value out;
    if (!transaction.Begin() || codes.Del(2) == 0) return false;
    if (tokens.Add(with().user, with().a, with().scope, with().eighth, with().ninth, with().expiry,
                   with().flow, with().state, with().ip4, out)) {
      return transaction.Commit();
    }
    codes.SetErrCode(tokens.GetErrCode());
    codes.SetErrMsg(tokens.GetErrMsg());
    return false;
  };
  return {change<Store>("RedeemCode", 1, redeem)};
}

std::vector<Operation> tokenLookUps() {
  using Store = OAUTHDBToken;
  const auto byAccess = [](Store& store, Json::Value& rows) {
    return store.GetWithAccessToken(with().second, &rows);
  };
  const auto byRefresh = [](Store& store, Json::Value& rows) {
    return store.GetWithRefreshToken(with().secondRefresh, &rows);
  };
  const auto index = [](Store& store, Json::Value& found) {
    found = store.GetIndex(with().second);
    return found != 0;
  };
  // "Expired" is an answer, too; only a look-up that failed is none.
  const auto verify = [](Store& store, Json::Value& result) {
    if (store.Verify(with().second, result)) return true;
    const support::Uncounted ours;
    return result[names::kErrCode] == errors::kAccessTokenExpired.code;
  };
  return {
      lookUp<Store>("GetTokenByAccessToken", byAccess),
      lookUp<Store>("GetTokenByRefreshToken", byRefresh),
      lookUp<Store>("GetTokenIndex", index),
      lookUp<Store>("GetTokenById", [](Store& store, auto& rows) { return store.Get(2, &rows); }),
      lookUp<Store>("GetEveryToken", [](Store& store, auto& rows) { return store.Get(&rows); }),
      lookUp<Store>("VerifyToken", verify),
  };
}

std::vector<Operation> logOperations() {
  using Store = OAUTHDBLog;
  const auto add = [](Store& store) { return store.Add(with().message); };
  const auto get = [](Store& store, Json::Value& rows) {
    return store.Get(with().filter, with().order, &rows);
  };
  Operation rotating = rowFirst(change<Store>("AddLogEntryWithRotation", 2, add));
  rotating.household = Household::kWithFullLog;
  return {
      change<Store>("AddLogEntry", 1, add),
      rotating,
      change<Store>("ClearLog", 1, [](Store& store) { return store.Del(); }),
      lookUp<Store>("GetLogEntries", get),
  };
}

// The rows before -------------------------------------------------------------

/// Seconds after kNow at which the four codes and token pairs expire.
constexpr std::array<int, 4> kExpiries{-30, 600, -20, -10};

void addClients() {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  clients.Add(id64('a'), id64('1'), "https://one.example/back", "read", "One", "1", out);
  clients.Add(id64('b'), id64('2'), "https://two.example/back", "write", "Two", "0", out);
}

void addCodesAndTokens() {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value out;
  char digit = '1';
  for (const int seconds : kExpiries) {
    const std::string expiry = std::to_string(kNow + seconds);
    const std::string refresh = std::string(63, 'f') + digit;
    codes.Add("user", id64('a'), "read", id64(digit), expiry, "state", "", out);
    tokens.Add("user", id64('a'), "read", refresh, id64(digit), expiry, "code", "state", "", out);
    ++digit;
  }
}

void addLogEntries() {
  OAUTHDBLog log(names::kLogTable);
  for (const int seconds : {-30, -20, -10}) {
    Clock::setTo(kNow + seconds);
    log.Add("entry of " + std::to_string(seconds));
  }
}

void dropTable(const char* table) {
  OAUTHDBLog store(table);
  store.DBDrop();
}

/// A transaction that has outgrown its memory has journal and pages on disk
/// before its end.
void leaveTransactionBehind() {
  const std::string journal = std::string(names::kDatabaseFile) + "-journal";
  const auto copy = [](const std::string& from, const std::string& to) {
    fs::copy_file(from, to, fs::copy_options::overwrite_existing);
  };
  sqlite3* db = nullptr;
  sqlite3_open(names::kDatabaseFile, &db);
  sqlite3_exec(db, "PRAGMA cache_size = 1; BEGIN", nullptr, nullptr, nullptr);
  for (const std::string table : {"oauth_token", "oauth_grantCode"}) {
    const std::string sql = "UPDATE " + table + " SET scope = hex(zeroblob(9000))";
    sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr);
  }
  copy(names::kDatabaseFile, "/tmp/left.db");
  copy(journal, "/tmp/left.db-journal");
  sqlite3_close(db);
  copy("/tmp/left.db", names::kDatabaseFile);
  copy("/tmp/left.db-journal", journal);
}

template <typename Choice>
std::vector<Operation> only(Choice choice) {
  std::vector<Operation> chosen;
  for (Operation& operation : everyOperation()) {
    if (choice(operation)) chosen.push_back(std::move(operation));
  }
  return chosen;
}

}  // namespace

void furnish(Household household) {
  Clock::setTo(kNow);
  if (household == Household::kAbsent) return;

  if (household == Household::kWithFullLog) {
    std::ofstream(names::kSettingsFile) << R"({"log_max": 3})";
  }
  Clock::setTo(kNow - 40);
  addClients();
  addCodesAndTokens();
  addLogEntries();
  if (household == Household::kWithoutLogTable) dropTable(names::kLogTable);
  if (household == Household::kWithoutMetaTable) dropTable(names::kMetaTable);
  if (household == Household::kWithHotJournal) leaveTransactionBehind();
  Clock::setTo(kNow);
}

bool isReady(OAUTHDBBasic& store) {
  return store.DBCmd("", nullptr, nullptr) != 0;
}

std::vector<Operation> everyOperation() {
  std::vector<Operation> all;
  for (auto part :
       {constructions, coreOperations, registrations, clientChanges, clientLookUps, codeChanges,
        codeLookUps, tokenChanges, tokenLookUps, transactions, logOperations}) {
    for (Operation& operation : part()) all.push_back(std::move(operation));
  }
  return all;
}

std::vector<Operation> everyWriter() {
  return only([](const Operation& operation) {
    return operation.units > 0 || operation.household == Household::kWithHotJournal;
  });
}

std::vector<Operation> everyChange() {
  return only([](const Operation& operation) {
    return operation.units > 0 && !operation.isConstruction();
  });
}

std::vector<Operation> everyLookUp() {
  return only([](const Operation& operation) {
    return operation.units == 0 && !operation.isConstruction();
  });
}

void PrintTo(const Operation& operation, std::ostream* out) {
  *out << operation.name;
}

}  // namespace faults
