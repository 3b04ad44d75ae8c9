#include "tests/load/visitor.h"

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/support/system_log.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace load {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBBasic;
using KELDOAUTHSERVER::OAUTHDBClientInfo;
using KELDOAUTHSERVER::OAUTHDBGrantCode;
using KELDOAUTHSERVER::OAUTHDBToken;

namespace {

constexpr char kLongAgo[] = "1";
constexpr char kAddress[] = "192.0.2.7";

std::string anyIdentifier() {
  return KELDOAUTHSERVER::getRandomStr(64);
}

std::string textOf(const Json::Value& document, const char* member) {
  return document[member].asString();
}

}  // namespace

void Visitor::visit(int rounds) {
  for (; round_ < rounds; ++round_) {
    const std::size_t failuresBefore = ledger_.failures.size();
    registerClient();
    redeemCode();
    useTokens();
    leaveExpired();
    if (purges_) purge();
    // Nothing that succeeds says a word, and the audit entry fails in silence.
    for (const std::string& line : support::SystemLog::texts()) {
      ledger_.failures.push_back(name() + " log: " + line);
    }
    support::SystemLog::clear();
    ++ledger_.rounds;
    if (ledger_.failures.size() > failuresBefore) ++ledger_.failedRounds;
  }
}

void Visitor::registerClient() {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  if (took("register", clients, clients.Add("https://app.example/cb", "read", name(), out) != 0)) {
    ledger_.add(names::kClientInfoTable, name());
  }
}

void Visitor::redeemCode() {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value issued;
  if (!took("issue code", codes,
            codes.Add(name(), anyIdentifier(), "read", "state", kAddress, issued) != 0)) {
    return;
  }
  const std::string code = textOf(issued, names::kCode);
  ledger_.add(names::kGrantCodeTable, code);
  Json::Value rows;
  took("find code", codes, codes.Get(code, &rows) != 0 && rows.size() == 1);
  Json::Value request;
  request[names::kCondition][names::kCode] = code;
  if (took("redeem code", codes, codes.DBDel(request))) {
    ledger_.remove(names::kGrantCodeTable, code);
  }
}

/// One pair is revoked, one stays.
void Visitor::useTokens() {
  OAUTHDBToken tokens(names::kTokenTable);
  for (const bool revoked : {true, false}) {
    Json::Value issued;
    if (!took(
            "issue token", tokens,
            tokens.Add(name(), anyIdentifier(), "read", "code", "state", kAddress, issued) != 0)) {
      continue;
    }
    const std::string token = textOf(issued, names::kAccessToken);
    ledger_.add(names::kTokenTable, token);
    Json::Value owner;
    took("verify", tokens, tokens.Verify(token, owner) && textOf(owner, "username") == name());
    if (revoked && took("revoke", tokens, tokens.Revoke(tokens.GetIndex(token)))) {
      ledger_.remove(names::kTokenTable, token);
    }
  }
}

/// What nobody came back for.
void Visitor::leaveExpired() {
  Json::Value out;
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  took("leave code", codes,
       codes.Add(name(), anyIdentifier(), "read", anyIdentifier(), kLongAgo, "state", kAddress,
                 out) != 0);
  OAUTHDBToken tokens(names::kTokenTable);
  took("leave token", tokens,
       tokens.Add(name(), anyIdentifier(), "read", anyIdentifier(), anyIdentifier(), kLongAgo,
                  "code", "state", kAddress, out));
}

void Visitor::purge() {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  took("purge codes", codes, codes.Purge() != 0);
  OAUTHDBToken tokens(names::kTokenTable);
  took("purge tokens", tokens, tokens.Purge());
}

/// A success leaves no error behind.
bool Visitor::took(const char* call, const OAUTHDBBasic& store, bool success) {
  ++ledger_.calls;
  if (!success || store.GetErrCode() != 255) {
    ++ledger_.failedCalls;
    ledger_.failures.push_back(name() + ' ' + call + ": " + std::to_string(store.GetErrCode()) +
                               ' ' + store.GetErrMsg());
  }
  return success;
}

std::string Visitor::name() const {
  return "visitor " + std::to_string(number_) + " round " + std::to_string(round_);
}

}  // namespace load
