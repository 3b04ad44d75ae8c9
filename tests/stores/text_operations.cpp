#include "tests/stores/text_operations.h"

#include <ostream>
#include <utility>

using namespace KELDOAUTHSERVER;
using support::id64;

namespace {

/// The usual arguments, with changes.
class Arguments {
 public:
  explicit Arguments(const Texts& changes)
      : texts_{{"client_id", id64('n')},
               {"client_secret", id64('s')},
               {"redirect_uri", "https://app.example/cb"},
               {"scope", "read"},
               {"display_name", "App"},
               {"enable", "1"},
               {"username", "alice"},
               {"code", id64('k')},
               {"access_token", id64('t')},
               {"refresh_token", id64('u')},
               {"expired_time", "9999999999"},
               {"flow_type", "authorization_code"},
               {"state", "xyz"},
               {"ip", "10.0.0.1"}} {
    for (const auto& [name, text] : changes) texts_.at(name) = text;
  }
  const std::string& operator[](const char* name) const { return texts_.at(name); }

 private:
  Texts texts_;
};

/// The look-ups, with the key of the row with id 1 unless it is changed.
std::string keyOf(const Texts& changes, const char* name, char usual) {
  const auto changed = changes.find(name);
  return changed == changes.end() ? id64(usual) : changed->second;
}

const Argument kUsername{"username", 1, 256};
const Argument kClientId{"client_id", 64, 64};
const Argument kClientSecret{"client_secret", 64, 64};
const Argument kRedirectUri{"redirect_uri", 3, 2048};
const Argument kScope{"scope", 1, 2048};
const Argument kDisplayName{"display_name", 1, 64};
const Argument kCode{"code", 64, 64};
const Argument kRefreshToken{"refresh_token", 64, 64};
const Argument kAccessToken{"access_token", 64, 64};
const Argument kExpiredTime{"expired_time", 1, 128};
const Argument kFlowType{"flow_type", 1, 32};
const Argument kState{"state", 1, 2048};

Argument asGiven(Argument argument) {
  argument.stored = Stored::kAsGiven;
  return argument;
}
Argument sought(Argument argument) {
  argument.stored = Stored::kNever;
  return argument;
}

constexpr char kFirstRow[] = "1";
constexpr char kNewRow[] = "3";
constexpr char kNoRow[] = "";

Argument generated(Argument argument) {
  argument.stored = Stored::kGenerated;
  return argument;
}

template <typename Edit>
auto onFirstRow(Edit edit) {
  return [edit](const Texts& changes, Json::Value& /*out*/) { return edit(1, changes); };
}

std::vector<Operation> clientOperations() {
  const char* table = names::kClientInfoTable;
  const std::string refusedAdd = "oauth_clientInfo:76 Bad parameters";
  const std::string refusedGet = "oauth_clientInfo:180 Bad parameters";
  using Add = Aftermath (*)(const Texts&, Json::Value&);
  return {
      {"ClientAdd",
       table,
       {kClientId, kClientSecret, kRedirectUri, kScope, kDisplayName},
       -2,
       refusedAdd,
       kNewRow,
       static_cast<Add>(addClient)},
      {"ClientAddGenerated",
       table,
       {generated(kClientId), generated(kClientSecret), kRedirectUri, kScope, kDisplayName},
       -2,
       refusedAdd,
       kNewRow,
       addGeneratedClient},
      {"ClientAddWithSecret",
       table,
       {generated(kClientId), kClientSecret, kRedirectUri, kScope, kDisplayName},
       -2,
       refusedAdd,
       kNewRow,
       addClientWithSecret},
      {"ClientEdit",
       table,
       {kRedirectUri, kScope, kDisplayName},
       -2,
       "oauth_clientInfo:115 Bad parameters",
       kFirstRow,
       onFirstRow(editClient)},
      {"ClientGet",
       table,
       {sought(kClientId)},
       -2,
       refusedGet,
       kNoRow,
       [](const Texts& changes, Json::Value& out) {
         return onClients([&](auto& s) { return s.Get(keyOf(changes, "client_id", 'c'), &out); });
       }},
      {"ClientGetIndex",
       table,
       {sought(kClientId)},
       -2,
       refusedGet,
       kNoRow,
       [](const Texts& changes, Json::Value& /*out*/) {
         return onClients([&](auto& s) { return s.GetIndex(keyOf(changes, "client_id", 'c')); });
       }},
  };
}

std::vector<Operation> codeOperations() {
  const char* table = names::kGrantCodeTable;
  const std::string refusedAdd = "oauth_grantCode:71 Bad parameters";
  const std::string refusedGet = "oauth_grantCode:194 Bad parameters";
  using Add = Aftermath (*)(const Texts&, Json::Value&);
  return {
      {"CodeAdd",
       table,
       {kUsername, kClientId, kScope, kCode, asGiven(kExpiredTime), kState},
       kCodeBefore,
       refusedAdd,
       kNewRow,
       static_cast<Add>(addCode)},
      {"CodeIssue",
       table,
       {kUsername, kClientId, kScope, generated(kCode), generated(kExpiredTime), kState},
       kCodeBefore,
       refusedAdd,
       kNewRow,
       static_cast<Add>(issueCode)},
      {"CodeEdit",
       table,
       {asGiven(kUsername), asGiven(kClientId), asGiven(kScope), asGiven(kState)},
       kCodeBefore,
       "oauth_grantCode:103 Bad parameters",
       kFirstRow,
       onFirstRow(editCode)},
      {"CodeEditAndExpiry",
       table,
       {kUsername, kClientId, kScope, asGiven(kExpiredTime), kState},
       kCodeBefore,
       "oauth_grantCode:134 Bad parameters",
       kFirstRow,
       onFirstRow(editCodeAndExpiry)},
      {"CodeGet",
       table,
       {sought(kCode)},
       -2,
       refusedGet,
       kNoRow,
       [](const Texts& changes, Json::Value& out) {
         return onCodes([&](auto& s) { return s.Get(keyOf(changes, "code", 'g'), &out); });
       }},
      {"CodeGetIndex",
       table,
       {sought(kCode)},
       -2,
       refusedGet,
       kNoRow,
       [](const Texts& changes, Json::Value& /*out*/) {
         return onCodes([&](auto& s) { return s.GetIndex(keyOf(changes, "code", 'g')); });
       }},
  };
}

std::vector<Operation> tokenChanges() {
  const char* table = names::kTokenTable;
  const std::string refusedAdd = "oauth_token:80 Bad parameters";
  using Add = Aftermath (*)(const Texts&, Json::Value&);
  return {
      {"TokenAdd",
       table,
       {kUsername, kClientId, kScope, kRefreshToken, kAccessToken, kExpiredTime, kFlowType, kState},
       -2,
       refusedAdd,
       kNewRow,
       static_cast<Add>(addToken)},
      {"TokenIssue",
       table,
       {kUsername, kClientId, kScope, generated(kRefreshToken), generated(kAccessToken),
        generated(kExpiredTime), kFlowType, kState},
       -2,
       refusedAdd,
       kNewRow,
       static_cast<Add>(issueToken)},
      {"TokenEdit",
       table,
       {asGiven(kUsername), asGiven(kClientId), asGiven(kScope), asGiven(kFlowType),
        asGiven(kState)},
       -2,
       "oauth_token:122 Bad parameters",
       kFirstRow,
       onFirstRow(editToken)},
      {"TokenEditAndExpiry",
       table,
       {kUsername, kClientId, kScope, asGiven(kExpiredTime), kFlowType, kState},
       -2,
       "oauth_token:159 Bad parameters",
       kFirstRow,
       onFirstRow(editTokenAndExpiry)},
  };
}

std::vector<Operation> tokenLookups() {
  const char* table = names::kTokenTable;
  const std::string refusedAccess = "oauth_token:212 Bad parameters";
  return {
      {"TokenGetWithAccessToken",
       table,
       {sought(kAccessToken)},
       -2,
       refusedAccess,
       kNoRow,
       [](const Texts& changes, Json::Value& out) {
         return onTokens([&](auto& s) {
           return s.GetWithAccessToken(keyOf(changes, "access_token", 'a'), &out);
         });
       }},
      {"TokenGetWithRefreshToken",
       table,
       {sought(kRefreshToken)},
       -2,
       "oauth_token:230 Bad parameters",
       kNoRow,
       [](const Texts& changes, Json::Value& out) {
         return onTokens([&](auto& s) {
           return s.GetWithRefreshToken(keyOf(changes, "refresh_token", 'r'), &out);
         });
       }},
      {"TokenGetIndex",
       table,
       {sought(kAccessToken)},
       -2,
       refusedAccess,
       kNoRow,
       [](const Texts& changes, Json::Value& /*out*/) {
         return onTokens([&](auto& s) { return s.GetIndex(keyOf(changes, "access_token", 'a')); });
       }},
      {"TokenVerify",
       table,
       {sought(kAccessToken)},
       -2,
       refusedAccess,
       kNoRow,
       [](const Texts& changes, Json::Value& /*out*/) {
         Json::Value verdict;
         return onTokens(
             [&](auto& s) { return s.Verify(keyOf(changes, "access_token", 'a'), verdict); });
       }},
  };
}

}  // namespace

Aftermath addClient(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onClients([&](auto& store) {
    return store.Add(a["client_id"], a["client_secret"], a["redirect_uri"], a["scope"],
                     a["display_name"], a["enable"], out);
  });
}
Aftermath addClient(const Texts& changes) {
  Json::Value out;
  return addClient(changes, out);
}
Aftermath addGeneratedClient(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onClients([&](auto& store) {
    return store.Add(a["redirect_uri"], a["scope"], a["display_name"], out);
  });
}
Aftermath addClientWithSecret(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onClients([&](auto& store) {
    return store.Add(a["client_secret"], a["redirect_uri"], a["scope"], a["display_name"], out);
  });
}
Aftermath editClient(long long id, const Texts& changes) {
  const Arguments a(changes);
  return onClients([&](auto& store) {
    return store.Edit(id, a["redirect_uri"], a["scope"], a["display_name"]);
  });
}

Aftermath addCode(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onCodes([&](auto& store) {
    return store.Add(a["username"], a["client_id"], a["scope"], a["code"], a["expired_time"],
                     a["state"], a["ip"], out);
  });
}
Aftermath addCode(const Texts& changes) {
  Json::Value out;
  return addCode(changes, out);
}
Aftermath issueCode(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onCodes([&](auto& store) {
    return store.Add(a["username"], a["client_id"], a["scope"], a["state"], a["ip"], out);
  });
}
Aftermath issueCode(const Texts& changes) {
  Json::Value out;
  return issueCode(changes, out);
}
Aftermath editCode(long long id, const Texts& changes) {
  const Arguments a(changes);
  return onCodes([&](auto& store) {
    return store.Edit(id, a["username"], a["client_id"], a["scope"], a["state"]);
  });
}
Aftermath editCodeAndExpiry(long long id, const Texts& changes) {
  const Arguments a(changes);
  return onCodes([&](auto& store) {
    return store.Edit(id, a["username"], a["client_id"], a["scope"], a["expired_time"], a["state"]);
  });
}

Aftermath addToken(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onTokens([&](auto& store) {
    return store.Add(a["username"], a["client_id"], a["scope"], a["refresh_token"],
                     a["access_token"], a["expired_time"], a["flow_type"], a["state"], a["ip"],
                     out);
  });
}
Aftermath addToken(const Texts& changes) {
  Json::Value out;
  return addToken(changes, out);
}
Aftermath issueToken(const Texts& changes, Json::Value& out) {
  const Arguments a(changes);
  return onTokens([&](auto& store) {
    return store.Add(a["username"], a["client_id"], a["scope"], a["flow_type"], a["state"], a["ip"],
                     out);
  });
}
Aftermath issueToken(const Texts& changes) {
  Json::Value out;
  return issueToken(changes, out);
}
Aftermath editToken(long long id, const Texts& changes) {
  const Arguments a(changes);
  return onTokens([&](auto& store) {
    return store.Edit(id, a["username"], a["client_id"], a["scope"], a["flow_type"], a["state"]);
  });
}
Aftermath editTokenAndExpiry(long long id, const Texts& changes) {
  const Arguments a(changes);
  return onTokens([&](auto& store) {
    return store.Edit(id, a["username"], a["client_id"], a["scope"], a["expired_time"],
                      a["flow_type"], a["state"]);
  });
}

void PrintTo(const Operation& operation, std::ostream* out) {
  *out << operation.name;
}
void PrintTo(const OperationArgument& argument, std::ostream* out) {
  *out << argument.operation.name << "_" << argument.argument.name;
}

const std::vector<Operation>& operations() {
  static const std::vector<Operation> all = [] {
    std::vector<Operation> found;
    for (const auto& part :
         {clientOperations(), codeOperations(), tokenChanges(), tokenLookups()}) {
      found.insert(found.end(), part.begin(), part.end());
    }
    return found;
  }();
  return all;
}

std::vector<OperationArgument> operationArguments() {
  std::vector<OperationArgument> all;
  for (const Operation& operation : operations()) {
    for (const Argument& argument : operation.arguments) {
      if (argument.stored != Stored::kGenerated) all.push_back({operation, argument});
    }
  }
  return all;
}

void OperationsTest::SetUp() {
  StoreTest::SetUp();
  startAfresh();
}

void OperationsTest::startAfresh() {
  std::string script = "BEGIN;";
  for (const char* table :
       {names::kClientInfoTable, names::kGrantCodeTable, names::kTokenTable, names::kLogTable}) {
    script += std::string("DELETE FROM ") + table + ";";
  }
  script += insertionOfClient({{"id", "1"}});
  script += insertionOfClient({{"id", "2"}, {"client_id", cipher(id64('d'))}});
  script += insertionOfCode({{"id", "1"}});
  script += insertionOfCode({{"id", "2"}, {"code", id64('h')}});
  script += insertionOfToken({{"id", "1"}});
  script +=
      insertionOfToken({{"id", "2"}, {"access_token", id64('b')}, {"refresh_token", id64('q')}});
  script += insertionOfLog({{"id", "1"}}) + insertionOfLog({{"id", "2"}});
  sql(script + "COMMIT;");
}

std::string textOf(std::size_t bytes) {
  return std::string(bytes, 'x');
}
