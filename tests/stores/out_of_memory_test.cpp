// Every operation with each of its allocations failing in turn: it gets by
// without, or it fails as a whole and says so.

#include <gmock/gmock.h>
#include <json/value.h>

#include <cstdio>
#include <functional>
#include <optional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"
#include "tests/support/allocations.h"

using namespace KELDOAUTHSERVER;
using support::failEachAllocation;
using support::id64;
using support::Row;
using support::SystemLog;

namespace {

constexpr int kNoMemory = 7;
constexpr int kFull = -5;
constexpr char kUnexpected[] = "Unexpected failure[std::bad_alloc]";

// Texts made beforehand, so that only the library allocates.
const std::string kClientId = id64('n');
const std::string kSecret = id64('s');
const std::string kAddress = "https://application.example/callback";
const std::string kScope = "a scope of more than fifteen bytes";
const std::string kName = "a name of more than fifteen bytes";
const std::string kEnabled = "1";
const std::string kCode = id64('k');
const std::string kAccess = id64('t');
const std::string kRefresh = id64('u');
const std::string kExpiry = "99999999999999999999";
const std::string kFlow = "authorization_code";
const std::string kState = "a state of more than fifteen bytes";
const std::string kIp = "2001:0db8:0000:0000:0000:ff00:0042:8329";
const std::string kMessage = "a message of more than fifteen bytes";
const std::string kOption = "ORDER BY id DESC LIMIT 10";
const std::string kClient = id64('c');
const std::string kFoundCode = id64('g');
const std::string kFoundAccess = id64('a');
const std::string kFoundRefresh = id64('r');

/// What the operations write to.
Json::Value document;

/// One operation on the seeded world, and what the file must hold when it says
/// that it succeeded.
template <typename Store>
struct MemoryCase {
  const char* name;
  std::function<bool(Store& store)> run;
  const char* proof;  // a query with one row, one column
  const char* answer;
};

template <typename Store>
void PrintTo(const MemoryCase<Store>& c, std::ostream* out) {
  *out << c.name;
}

template <typename Store>
class MemoryTest : public OperationsTest, public ::testing::WithParamInterface<MemoryCase<Store>> {
 protected:
  /// Lets each allocation of the operation fail in turn.
  void failEach(const char* table) {
    writeSettings(R"({"client_info_max": 50, "grantcode_expired": 60, "token_max": 50})");
    Store store(table);
    prepare(store);
    const int failures = failEachAllocation([&] { ok_ = this->GetParam().run(store); },
                                            [&](int nth) {
                                              SCOPED_TRACE(nth);
                                              expectAllOrNothing(store);
                                              prepare(store);
                                            });
    EXPECT_TRUE(ok_) << "without a failure";
    EXPECT_GT(failures, 0);
  }

 private:
  void prepare(Store& store) {
    startAfresh();
    before_ = everything();
    document = Json::Value();
    store.SetErrCode(kCodeBefore);
    store.SetErrMsg(kMessageBefore);
    SystemLog::clear();
  }

  void expectAllOrNothing(const Store& store) {
    if (ok_) {
      EXPECT_EQ(store.GetErrCode(), kCodeBefore);
      EXPECT_EQ(sqlText(this->GetParam().proof), this->GetParam().answer);
      return;
    }
    // A count that fails, for whatever reason, reads as a full table.
    EXPECT_THAT(store.GetErrCode(), ::testing::AnyOf(kNoMemory, kFull));
    EXPECT_THAT(store.GetErrMsg(), store.GetErrCode() == kFull
                                       ? ::testing::EndsWith("Table is full")
                                       : ::testing::EndsWith("out of memory"));
    EXPECT_EQ(SystemLog::count(kUnexpected), 1);
    EXPECT_EQ(everything(), before_);
  }

  bool ok_ = false;
  std::vector<Row> before_;
};

// Clients -----------------------------------------------------------------------

using ClientMemoryTest = MemoryTest<OAUTHDBClientInfo>;
constexpr char kNothing[] = "SELECT 1;";  // look-ups leave no proof

const MemoryCase<OAUTHDBClientInfo> kClientCases[] = {
    {"Add",
     [](auto& s) {
       return s.Add(kClientId, kSecret, kAddress, kScope, kName, kEnabled, document) != 0;
     },
     "SELECT count(*) FROM oauth_clientInfo;", "3"},
    {"AddGenerated", [](auto& s) { return s.Add(kAddress, kScope, kName, document) != 0; },
     "SELECT count(*) FROM oauth_clientInfo;", "3"},
    {"AddWithSecret",
     [](auto& s) { return s.Add(kSecret, kAddress, kScope, kName, document) != 0; },
     "SELECT count(*) FROM oauth_clientInfo;", "3"},
    {"Edit", [](auto& s) { return s.Edit(1, kAddress, kScope, kName) != 0; },
     "SELECT display_name FROM oauth_clientInfo WHERE id=1;", "a name of more than fifteen bytes"},
    {"Enable", [](auto& s) { return s.Enable(1) != 0; },
     "SELECT enable FROM oauth_clientInfo WHERE id=1;", "1"},
    {"Disable", [](auto& s) { return s.Disable(1) != 0; },
     "SELECT enable FROM oauth_clientInfo WHERE id=1;", "0"},
    {"Del", [](auto& s) { return s.Del(1) != 0; }, "SELECT count(*) FROM oauth_clientInfo;", "1"},
    {"Get", [](auto& s) { return s.Get(kClient, &document) != 0 && document.size() == 1; },
     kNothing, "1"},
    {"GetIndex", [](auto& s) { return s.GetIndex(kClient) == 1; }, kNothing, "1"},
    {"GetById", [](auto& s) { return s.Get(1LL, &document) != 0 && document.size() == 1; },
     kNothing, "1"},
    {"GetAll", [](auto& s) { return s.Get(&document) != 0 && document.size() == 2; }, kNothing,
     "1"},
};

TEST_P(ClientMemoryTest, FailsAsAWholeOrGetsBy) {
  failEach(names::kClientInfoTable);
}

INSTANTIATE_TEST_SUITE_P(Stores, ClientMemoryTest, ::testing::ValuesIn(kClientCases),
                         ::testing::PrintToStringParamName());

// Codes -------------------------------------------------------------------------

using CodeMemoryTest = MemoryTest<OAUTHDBGrantCode>;

const MemoryCase<OAUTHDBGrantCode> kCodeCases[] = {
    {"Add",
     [](auto& s) {
       return s.Add(kName, kClientId, kScope, kCode, kExpiry, kState, kIp, document) != 0;
     },
     "SELECT count(*) FROM oauth_grantCode;", "3"},
    {"Issue", [](auto& s) { return s.Add(kName, kClientId, kScope, kState, kIp, document) != 0; },
     "SELECT count(*) FROM oauth_grantCode;", "3"},
    {"Edit", [](auto& s) { return s.Edit(1, kName, kClientId, kScope, kState) != 0; },
     "SELECT username FROM oauth_grantCode WHERE id=1;", "a name of more than fifteen bytes"},
    {"EditAndExpiry",
     [](auto& s) { return s.Edit(1, kName, kClientId, kScope, kExpiry, kState) != 0; },
     "SELECT expired_time FROM oauth_grantCode WHERE id=1;", "99999999999999999999"},
    {"Revoke", [](auto& s) { return s.Revoke(1) != 0; },
     "SELECT expired_time < '99' FROM oauth_grantCode WHERE id=1;", "1"},
    {"Del", [](auto& s) { return s.Del(1) != 0; }, "SELECT count(*) FROM oauth_grantCode;", "1"},
    {"Get", [](auto& s) { return s.Get(kFoundCode, &document) != 0 && document.size() == 1; },
     kNothing, "1"},
    {"GetIndex", [](auto& s) { return s.GetIndex(kFoundCode) == 1; }, kNothing, "1"},
};

TEST_P(CodeMemoryTest, FailsAsAWholeOrGetsBy) {
  failEach(names::kGrantCodeTable);
}

INSTANTIATE_TEST_SUITE_P(Stores, CodeMemoryTest, ::testing::ValuesIn(kCodeCases),
                         ::testing::PrintToStringParamName());

// Tokens ------------------------------------------------------------------------

using TokenMemoryTest = MemoryTest<OAUTHDBToken>;

const MemoryCase<OAUTHDBToken> kTokenCases[] = {
    {"Add",
     [](auto& s) {
       return s.Add(kName, kClientId, kScope, kRefresh, kAccess, kExpiry, kFlow, kState, kIp,
                    document);
     },
     "SELECT count(*) FROM oauth_token;", "3"},
    {"Issue",
     [](auto& s) { return s.Add(kName, kClientId, kScope, kFlow, kState, kIp, document) != 0; },
     "SELECT count(*) FROM oauth_token;", "3"},
    {"Edit", [](auto& s) { return s.Edit(1, kName, kClientId, kScope, kFlow, kState); },
     "SELECT username FROM oauth_token WHERE id=1;", "a name of more than fifteen bytes"},
    {"EditAndExpiry",
     [](auto& s) { return s.Edit(1, kName, kClientId, kScope, kExpiry, kFlow, kState); },
     "SELECT expired_time FROM oauth_token WHERE id=1;", "99999999999999999999"},
    {"Revoke", [](auto& s) { return s.Revoke(1); }, "SELECT count(*) FROM oauth_token;", "1"},
    {"Del", [](auto& s) { return s.Del(1); }, "SELECT count(*) FROM oauth_token;", "1"},
    {"GetWithAccessToken",
     [](auto& s) { return s.GetWithAccessToken(kFoundAccess, &document) && document.size() == 1; },
     kNothing, "1"},
    {"GetWithRefreshToken",
     [](auto& s) {
       return s.GetWithRefreshToken(kFoundRefresh, &document) && document.size() == 1;
     },
     kNothing, "1"},
    {"GetIndex", [](auto& s) { return s.GetIndex(kFoundAccess) == 1; }, kNothing, "1"},
    {"Verify", [](auto& s) { return s.Verify(kFoundAccess, document) && document.size() == 3; },
     kNothing, "1"},
};

TEST_P(TokenMemoryTest, FailsAsAWholeOrGetsBy) {
  failEach(names::kTokenTable);
}

INSTANTIATE_TEST_SUITE_P(Stores, TokenMemoryTest, ::testing::ValuesIn(kTokenCases),
                         ::testing::PrintToStringParamName());

/// One deletion that fails for want of memory does not stop the others, as any
/// other failure would not.
class PurgeMemoryTest : public OperationsTest {};

TEST_F(PurgeMemoryTest, NeverClaimsRowsThatAreStillThere) {
  OAUTHDBToken store(names::kTokenTable);
  const auto prepare = [&] {
    startAfresh();
    sql("UPDATE oauth_token SET expired_time='5';");
    store.SetErrCode(kCodeBefore);
    SystemLog::clear();
  };
  bool ok = false;
  prepare();
  failEachAllocation(
      [&] { ok = store.Purge(); },
      [&](int nth) {
        SCOPED_TRACE(nth);
        if (ok) {
          // Rows that cannot be read are nothing to purge.
          EXPECT_TRUE(rowCount("oauth_token") == 0 || store.GetErrCode() == kNoMemory);
        } else {
          EXPECT_EQ(store.GetErrCode(), kNoMemory);
          EXPECT_EQ(SystemLog::count(kUnexpected), 1);
          EXPECT_GT(rowCount("oauth_token"), 0);
        }
        prepare();
      });
  EXPECT_TRUE(ok);
  EXPECT_EQ(rowCount("oauth_token"), 0);
}

TEST_F(PurgeMemoryTest, LeavesNoTransactionOpen) {
  OAUTHDBToken store(names::kTokenTable);
  const auto prepare = [&] {
    startAfresh();
    sql("UPDATE oauth_token SET expired_time='5';");
  };
  prepare();
  failEachAllocation([&] { store.Purge(); },
                     [&](int nth) {
                       EXPECT_NE(store.DBCmd("BEGIN; COMMIT;", nullptr, nullptr), 0) << nth;
                       prepare();
                     });
}

// The log -----------------------------------------------------------------------

using LogMemoryTest = MemoryTest<OAUTHDBLog>;

const MemoryCase<OAUTHDBLog> kLogCases[] = {
    {"Add", [](auto& s) { return s.Add(kMessage) != 0; }, "SELECT msg FROM oauth_log WHERE id=3;",
     "a message of more than fifteen bytes"},
    {"Get", [](auto& s) { return s.Get("", kOption, &document) != 0 && document.size() == 2; },
     kNothing, "1"},
    {"FilteredGet", [](auto& s) { return s.Get(kMessage, "", &document) != 0 && document.empty(); },
     kNothing, "1"},
    {"Del", [](auto& s) { return s.Del() != 0; }, "SELECT count(*) FROM oauth_log;", "0"},
};

TEST_P(LogMemoryTest, FailsAsAWholeOrGetsBy) {
  failEach(names::kLogTable);
}

INSTANTIATE_TEST_SUITE_P(Stores, LogMemoryTest, ::testing::ValuesIn(kLogCases),
                         ::testing::PrintToStringParamName());

// Construction ------------------------------------------------------------------

class ConstructionMemoryTest : public StoreTest {
 protected:
  /// Constructs a store with each allocation failing in turn. One that lacks
  /// something is not ready.
  template <typename Store>
  static void failEach(const std::string& table, const std::function<void()>& prepare) {
    std::optional<Store> store;
    prepare();
    SystemLog::clear();
    failEachAllocation([&] { store.emplace(table); },
                       [&](int nth) {
                         SCOPED_TRACE(nth);
                         expectReadyOrNot(*store, table);
                         store.reset();
                         prepare();
                         SystemLog::clear();
                       });
    EXPECT_EQ(store->GetErrCode(), 255);
    EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta;"), "3");
  }

 private:
  static void expectReadyOrNot(OAUTHDBBasic& store, const std::string& table) {
    const int code = store.GetErrCode();
    const bool isReady = store.DBCmd("SELECT 1;", nullptr, nullptr) != 0;
    if (isReady) {
      EXPECT_EQ(code, 255);
      EXPECT_EQ(store.GetTabName(), table);
      EXPECT_EQ(sqlText("SELECT count(*) FROM oauth_meta;"), "3");
    } else {
      EXPECT_EQ(code, kNoMemory);
      EXPECT_EQ(store.GetErrMsg(), "out of memory");
      EXPECT_EQ(SystemLog::count(kUnexpected), 1);
    }
  }
};

void removeNothing() {}

TEST_F(ConstructionMemoryTest, OverAnExistingFile) {
  failEach<OAUTHDBClientInfo>(names::kClientInfoTable, removeNothing);
  failEach<OAUTHDBGrantCode>(names::kGrantCodeTable, removeNothing);
  failEach<OAUTHDBToken>(names::kTokenTable, removeNothing);
  failEach<OAUTHDBLog>(names::kLogTable, removeNothing);
}

/// The copy of the name is all that it needs memory for.
template <typename Store>
void lendWithoutMemory(OAUTHDBBasic& owner) {
  const std::string table = "a_table_name_of_more_than_fifteen_bytes";
  std::optional<Store> lent;
  const int failures = failEachAllocation([&] { lent.emplace(table, owner); },
                                          [&](int nth) {
                                            EXPECT_EQ(lent->DBCmd("SELECT 1;", nullptr, nullptr), 0)
                                                << nth;
                                            EXPECT_EQ(lent->GetErrCode(), kNoMemory) << nth;
                                            EXPECT_EQ(lent->GetErrMsg(), "out of memory") << nth;
                                            EXPECT_EQ(SystemLog::count(kUnexpected), 1) << nth;
                                            SystemLog::clear();
                                          });
  EXPECT_EQ(failures, 1);
  EXPECT_EQ(lent->GetTabName(), table);
  EXPECT_EQ(lent->GetErrCode(), 255);
  EXPECT_NE(lent->DBCmd("SELECT 1;", nullptr, nullptr), 0);
}

TEST_F(ConstructionMemoryTest, OnAnothersConnectionLeavesTheOwnerAlone) {
  OAUTHDBToken owner(names::kTokenTable);
  lendWithoutMemory<OAUTHDBClientInfo>(owner);
  lendWithoutMemory<OAUTHDBGrantCode>(owner);
  lendWithoutMemory<OAUTHDBToken>(owner);
  lendWithoutMemory<OAUTHDBLog>(owner);
  EXPECT_EQ(owner.GetErrCode(), 255);
  EXPECT_NE(owner.DBCmd("SELECT 1;", nullptr, nullptr), 0);
}

TEST_F(ConstructionMemoryTest, OverANewFile) {
  failEach<OAUTHDBToken>(names::kTokenTable, [] { std::remove(kDatabase); });
}

TEST_F(ConstructionMemoryTest, WithATableNameThatNeedsMemory) {
  failEach<OAUTHDBToken>("a_table_name_of_more_than_fifteen_bytes", removeNothing);
}

}  // namespace
