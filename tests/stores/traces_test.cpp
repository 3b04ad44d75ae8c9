// What each operation writes to the system log when it succeeds: at log level 1
// all of it, at the other levels and without the flag file nothing of its own.

#include <gmock/gmock.h>
#include <json/value.h>

#include <functional>
#include <ostream>
#include <string>

#include "tests/stores/text_operations.h"

using support::id64;
using support::LogLine;
using support::SystemLog;
using ::testing::Each;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::StartsWith;

namespace {

struct TraceCase {
  const char* name;
  std::function<Aftermath()> run;
  Lines expected;  // at log level 1
};
void PrintTo(const TraceCase& c, std::ostream* out) {
  *out << c.name;
}

class TraceTest : public OperationsTest, public ::testing::WithParamInterface<TraceCase> {
 protected:
  /// The lines of the operation alone, without those of the object's life.
  static Lines linesAtLevel(int level) {
    Lines lines;
    withDiagnostics(level, [&] {
      const Aftermath outcome = GetParam().run();
      EXPECT_TRUE(succeeded(outcome));
      lines = outcome.lines;
    });
    return lines;
  }

  static void expectNothingOfTheStores(const Lines& lines) {
    for (const char* source :
         {"oauth_clientInfo:", "oauth_grantCode:", "oauth_token:", "oauth_log:"}) {
      EXPECT_THAT(lines, Each(Not(StartsWith(source))));
    }
  }
};

TEST_P(TraceTest, IsCompleteAtLevel1) {
  EXPECT_THAT(linesAtLevel(1), ElementsAreArray(GetParam().expected));
}

TEST_P(TraceTest, HoldsNothingOfTheStoreAtOtherLevels) {
  expectNothingOfTheStores(linesAtLevel(2 | 4 | 8));
}

TEST_P(TraceTest, IsEmptyAtLevel0) {
  EXPECT_THAT(linesAtLevel(0), IsEmpty());
}

TEST_P(TraceTest, IsEmptyWithoutTheFlagFile) {
  writeSettings(R"({"log_level": 15})");
  Aftermath outcome;
  inFreshThread([&] { outcome = GetParam().run(); });
  EXPECT_TRUE(succeeded(outcome));
  EXPECT_THAT(outcome.lines, IsEmpty());
}

/// A document of nobody's interest.
Json::Value& scratch() {
  static Json::Value document;
  document = Json::Value();
  return document;
}

constexpr char kRows2[] = "oauth_db_basic Table Row Count[2]";
constexpr char kEncryptId[] = "oauth_db_basic ==> ParamEncrypt[client_id]";
constexpr char kEncryptSecret[] = "oauth_db_basic ==> ParamEncrypt[client_secret]";
constexpr char kDecryptId[] = "oauth_db_basic ==> ParamDecrypt[client_id]";
constexpr char kDecryptSecret[] = "oauth_db_basic ==> ParamDecrypt[client_secret]";
constexpr char kGetDone[] = "oauth_db_basic ClientInfo Get Done";
constexpr char kEdited[] = "oauth_db_basic ClientInfo Edit success, changed[1]";
constexpr char kDeleted[] = "oauth_db_basic ClientInfo Delete success, changed[1]";

/// A registration: the log opens, the row goes in, the entry goes in.
Lines registrationLines() {
  return {"oauth_clientInfo:49 ==> Add",
          "oauth_db_basic ==> DBInit[init token table]",
          "oauth_db_basic ==> DBInit[init grantCode table]",
          "oauth_db_basic ==> DBInit[init log table]",
          kRows2,
          kEncryptId,
          kEncryptSecret,
          "oauth_db_basic [oauth_clientInfo] Add success, changed[1]",
          "oauth_log:16 ==> Add",
          "oauth_db_basic [oauth_log] Add success, changed[1]"};
}

std::vector<TraceCase> clientTraces() {
  return {
      {"ClientAdd", [] { return addClient(); }, registrationLines()},
      {"ClientAddGenerated", [] { return addGeneratedClient({}, scratch()); }, registrationLines()},
      {"ClientAddWithSecret", [] { return addClientWithSecret({}, scratch()); },
       registrationLines()},
      {"ClientEdit", [] { return editClient(1); }, {"oauth_clientInfo:106 ==> Edit", kEdited}},
      {"ClientEnable",
       [] { return onClients([](auto& s) { return s.Enable(1); }); },
       {"oauth_clientInfo:130 ==> Enable", kEdited}},
      {"ClientDisable",
       [] { return onClients([](auto& s) { return s.Disable(1); }); },
       {"oauth_clientInfo:141 ==> Disable", kEdited}},
      {"ClientDel",
       [] { return onClients([](auto& s) { return s.Del(1); }); },
       {"oauth_clientInfo:152 ==> Del", kDeleted}},
      {"ClientGetIndex",
       [] { return onClients([](auto& s) { return s.GetIndex(id64('c')); }); },
       {"oauth_clientInfo:162 ==> GetIndex", "oauth_clientInfo:174 ==> Get", kEncryptId, kDecryptId,
        kDecryptSecret, kGetDone}},
      {"ClientGet",
       [] { return onClients([](auto& s) { return s.Get(id64('c'), &scratch()); }); },
       {"oauth_clientInfo:174 ==> Get", kEncryptId, kDecryptId, kDecryptSecret, kGetDone}},
      {"ClientGetById",
       [] { return onClients([](auto& s) { return s.Get(1LL, &scratch()); }); },
       {"oauth_clientInfo:192 ==> Get", kDecryptId, kDecryptSecret, kGetDone}},
      {"ClientGetAll",
       [] { return onClients([](auto& s) { return s.Get(&scratch()); }); },
       {"oauth_clientInfo:202 ==> Get", kDecryptId, kDecryptSecret, kDecryptId, kDecryptSecret,
        kGetDone}},
  };
}

std::vector<TraceCase> codeTraces() {
  const Lines added{"oauth_grantCode:47 ==> Add", kRows2, kEncryptId,
                    "oauth_db_basic [oauth_grantCode] Add success, changed[1]"};
  return {
      {"CodeAdd", [] { return addCode(); }, added},
      {"CodeIssue", [] { return issueCode(); }, added},
      {"CodeEditSilent", [] { return editCode(1); }, {kEncryptId, kEdited}},
      {"CodeEditAndExpiry",
       [] { return editCodeAndExpiry(1); },
       {"oauth_grantCode:126 ==> Edit", kEncryptId, kEdited}},
      {"CodeRevoke",
       [] { return onCodes([](auto& s) { return s.Revoke(1); }); },
       {"oauth_grantCode:151 ==> Revoke", kEdited}},
      {"CodeDel",
       [] { return onCodes([](auto& s) { return s.Del(1); }); },
       {"oauth_grantCode:166 ==> Del", kDeleted}},
      {"CodeGetIndex",
       [] { return onCodes([](auto& s) { return s.GetIndex(id64('g')); }); },
       {"oauth_grantCode:176 ==> GetIndex", "oauth_grantCode:188 ==> Get", kDecryptId, kGetDone}},
      {"CodeGet",
       [] { return onCodes([](auto& s) { return s.Get(id64('g'), &scratch()); }); },
       {"oauth_grantCode:188 ==> Get", kDecryptId, kGetDone}},
      {"CodeGetById",
       [] { return onCodes([](auto& s) { return s.Get(1LL, &scratch()); }); },
       {"oauth_grantCode:206 ==> Get", kDecryptId, kGetDone}},
      {"CodeGetAll",
       [] { return onCodes([](auto& s) { return s.Get(&scratch()); }); },
       {"oauth_grantCode:216 ==> Get", kDecryptId, kDecryptId, kGetDone}},
      {"CodePurge",
       [] {
         for (const int id : {1, 2}) editCodeAndExpiry(id, {{"expired_time", "5"}});
         return onCodes([](auto& s) { return s.Purge(); });
       },
       {"oauth_grantCode:225 ==> Purge", "oauth_grantCode:216 ==> Get", kDecryptId, kDecryptId,
        kGetDone, "oauth_grantCode:166 ==> Del", kDeleted, "oauth_grantCode:166 ==> Del",
        kDeleted}},
  };
}

std::vector<TraceCase> tokenTraces() {
  const Lines stored{"oauth_token:52 ==> Add", kRows2, kEncryptId,
                     "oauth_db_basic [oauth_token] Add success, changed[1]"};
  Lines issued = stored;
  issued.insert(issued.begin(), "oauth_token:28 ==> Add");
  const char* byAccess = "oauth_token:206 ==> GetWithAccessToken";
  return {
      {"TokenAdd", [] { return addToken(); }, stored},
      {"TokenIssue", [] { return issueToken(); }, issued},
      {"TokenEdit", [] { return editToken(1); }, {"oauth_token:111 ==> Edit", kEncryptId, kEdited}},
      {"TokenEditAndExpiry",
       [] { return editTokenAndExpiry(1); },
       {"oauth_token:147 ==> Edit", kEncryptId, kEdited}},
      {"TokenRevoke",
       [] { return onTokens([](auto& s) { return s.Revoke(1); }); },
       {"oauth_token:177 ==> Revoke", "oauth_token:184 ==> Del", kDeleted}},
      {"TokenDel",
       [] { return onTokens([](auto& s) { return s.Del(1); }); },
       {"oauth_token:184 ==> Del", kDeleted}},
      {"TokenGetIndex",
       [] { return onTokens([](auto& s) { return s.GetIndex(id64('a')); }); },
       {"oauth_token:194 ==> GetIndex", byAccess, kDecryptId, kGetDone}},
      {"TokenGetWithAccessToken",
       [] { return onTokens([](auto& s) { return s.GetWithAccessToken(id64('a'), &scratch()); }); },
       {byAccess, kDecryptId, kGetDone}},
      {"TokenGetWithRefreshToken",
       [] {
         return onTokens([](auto& s) { return s.GetWithRefreshToken(id64('r'), &scratch()); });
       },
       {"oauth_token:224 ==> GetWithRefreshToken", kDecryptId, kGetDone}},
      {"TokenGetById",
       [] { return onTokens([](auto& s) { return s.Get(1LL, &scratch()); }); },
       {"oauth_token:242 ==> Get", kDecryptId, kGetDone}},
      {"TokenGetAll",
       [] { return onTokens([](auto& s) { return s.Get(&scratch()); }); },
       {"oauth_token:252 ==> Get", kDecryptId, kDecryptId, kGetDone}},
      {"TokenPurge",
       [] {
         for (const int id : {1, 2}) editTokenAndExpiry(id, {{"expired_time", "5"}});
         return onTokens([](auto& s) { return s.Purge(); });
       },
       {"oauth_token:261 ==> Purge", "oauth_token:252 ==> Get", kDecryptId, kDecryptId, kGetDone,
        "oauth_token:184 ==> Del", kDeleted, "oauth_token:184 ==> Del", kDeleted}},
      {"TokenVerify",
       [] {
         Json::Value verdict;
         return onTokens([&](auto& s) { return s.Verify(id64('a'), verdict); });
       },
       {"oauth_token:282 ==> Verify", byAccess, kDecryptId, kGetDone}},
  };
}

std::vector<TraceCase> logTraces() {
  return {
      {"LogAdd",
       [] { return onLog([](auto& s) { return s.Add("hello"); }); },
       {"oauth_log:16 ==> Add", "oauth_db_basic [oauth_log] Add success, changed[1]"}},
      {"LogGet",
       [] { return onLog([](auto& s) { return s.Get("", "", &scratch()); }); },
       {"oauth_log:51 ==> Get", kGetDone}},
      {"LogDel",
       [] { return onLog([](auto& s) { return s.Del(); }); },
       {"oauth_log:41 ==> Del", "oauth_db_basic ClientInfo Delete success, changed[2]"}},
  };
}

INSTANTIATE_TEST_SUITE_P(Clients, TraceTest, ::testing::ValuesIn(clientTraces()),
                         ::testing::PrintToStringParamName());
INSTANTIATE_TEST_SUITE_P(Codes, TraceTest, ::testing::ValuesIn(codeTraces()),
                         ::testing::PrintToStringParamName());
INSTANTIATE_TEST_SUITE_P(Tokens, TraceTest, ::testing::ValuesIn(tokenTraces()),
                         ::testing::PrintToStringParamName());
INSTANTIATE_TEST_SUITE_P(Log, TraceTest, ::testing::ValuesIn(logTraces()),
                         ::testing::PrintToStringParamName());

// Refusals --------------------------------------------------------------------

/// Each refusal, traced: the entry line first, then what is always written.
class RefusalTraceTest : public OperationsTest, public ::testing::WithParamInterface<Operation> {
 protected:
  /// An operation refuses its first argument, empty.
  static Aftermath refuse() {
    Json::Value out;
    for (const Argument& argument : GetParam().arguments) {
      if (argument.stored == Stored::kGenerated) continue;
      return GetParam().run({{argument.name, ""}}, out);
    }
    return {};
  }
};

TEST_P(RefusalTraceTest, LineIsTheLastOfTheOperation) {
  Lines lines;
  withDiagnostics(1, [&] { lines = refuse().lines; });
  ASSERT_FALSE(lines.empty());
  EXPECT_EQ(lines.back(), GetParam().refusal);
  for (const std::string& line : lines) {
    EXPECT_THAT(line, Not(::testing::HasSubstr("success"))) << line;
  }
}

/// The journal leaves out what every line has in common: looked at here.
TEST_P(RefusalTraceTest, LineIsAnErrorWithSourceNumberAndTextApart) {
  refuse();
  const auto lines = SystemLog::lines();
  ASSERT_FALSE(lines.empty());
  EXPECT_EQ(lines.front().priority, 3);
  EXPECT_EQ(lines.front().format, "%s:%d Bad parameters");
  EXPECT_EQ(lines.front().text, GetParam().refusal);
}

INSTANTIATE_TEST_SUITE_P(Stores, RefusalTraceTest, ::testing::ValuesIn(operations()),
                         ::testing::PrintToStringParamName());

using StoreFormatTest = OperationsTest;

TEST_F(StoreFormatTest, EntryLineHasItsNameApart) {
  withDiagnostics(1, [] {
    KELDOAUTHSERVER::OAUTHDBToken store("oauth_token");
    SystemLog::clear();
    store.Revoke(1);
  });
  const LogLine line = SystemLog::lines().front();
  EXPECT_EQ(line.priority, 3);
  EXPECT_EQ(line.format, "%s:%d ==> %s");
  EXPECT_EQ(line.text, "oauth_token:177 ==> Revoke");
}

TEST_F(StoreFormatTest, FullTableLinesHaveNoArgumentsOfTheirOwn) {
  writeSettings(R"({"client_info_max": 1, "grantcode_max": 1, "token_max": 1})");
  for (const auto& [run, format] :
       {std::pair<std::function<Aftermath()>, std::string>{[] { return addClient(); },
                                                           "%s:%d ClientInfo Table is full"},
        {[] { return addCode(); }, "%s:%d GrantCode Table is full"},
        {[] { return addToken(); }, "%s:%d Token Table is full"}}) {
    run();
    EXPECT_EQ(SystemLog::lines().front().format, format);
    EXPECT_EQ(SystemLog::lines().front().priority, 3);
  }
}

TEST_F(StoreFormatTest, BadAddressLineHasTheReasonApart) {
  for (const Aftermath& outcome : {addCode({{"ip", "x"}}), addToken({{"ip", "x"}})}) {
    EXPECT_FALSE(outcome.ok);
    EXPECT_EQ(SystemLog::lines().front().format, "%s:%d Bad IP address[%s]");
    EXPECT_EQ(SystemLog::lines().front().priority, 3);
  }
}

TEST_F(StoreFormatTest, RotationFailureHasNoArgumentsOfItsOwn) {
  sql("CREATE TRIGGER refuse BEFORE DELETE ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  withDiagnostics(
      0,
      [] {
        KELDOAUTHSERVER::OAUTHDBLog store("oauth_log");
        store.Add("hello");
      },
      "\"log_max\": 1");
  EXPECT_EQ(SystemLog::lines().back().format, "%s:%d Log rotate failed");
  EXPECT_EQ(SystemLog::lines().back().priority, 3);
}

}  // namespace
