#include "tests/fuzz/store_operations.h"

#include <utility>

namespace fuzz {

namespace names = KELDOAUTHSERVER::names;

namespace {

constexpr std::size_t kAnyLength = 100000;

const Argument kClientId{names::kClientId, 64, 64};
const Argument kSecret{names::kClientSecret, 64, 64};
const Argument kRedirect{names::kRedirectUri, 3, 2048};
const Argument kScope{names::kScope, 1, 2048};
const Argument kDisplayName{names::kDisplayName, 1, 64};
const Argument kEnable{names::kEnable, 1, 1, Stored::kAsGiven};
const Argument kUsername{names::kUsername, 1, 256};
const Argument kCode{names::kCode, 64, 64};
const Argument kExpiry{names::kExpiredTime, 1, 128};
const Argument kState{names::kState, 1, 2048};
const Argument kFlow{names::kFlowType, 1, 32};
const Argument kAccess{names::kAccessToken, 64, 64};
const Argument kRefresh{names::kRefreshToken, 64, 64};
const Argument kIp{names::kIp, 0, kAnyLength};

Argument asGiven(Argument argument) {
  argument.stored = Stored::kAsGiven;
  return argument;
}

std::vector<Change> registrations() {
  return {
      {"register",
       names::kClientInfoTable,
       {kClientId, kSecret, kRedirect, kScope, kDisplayName, kEnable},
       -2,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.clients.Add(t[0], t[1], t[2], t[3], t[4], t[5], out) != 0;
       }},
      {"register, all drawn",
       names::kClientInfoTable,
       {kRedirect, kScope, kDisplayName},
       -2,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.clients.Add(t[0], t[1], t[2], out) != 0;
       },
       {names::kClientId, names::kClientSecret}},
      {"register, id drawn",
       names::kClientInfoTable,
       {kSecret, kRedirect, kScope, kDisplayName},
       -2,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.clients.Add(t[0], t[1], t[2], t[3], out) != 0;
       },
       {names::kClientId}},
  };
}

std::vector<Change> grants() {
  return {
      {"store code",
       names::kGrantCodeTable,
       {kUsername, kClientId, kScope, kCode, asGiven(kExpiry), kState, asGiven(kIp)},
       kNoCode,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.codes.Add(t[0], t[1], t[2], t[3], t[4], t[5], t[6], out) != 0;
       }},
      {"issue code",
       names::kGrantCodeTable,
       {kUsername, kClientId, kScope, kState, asGiven(kIp)},
       kNoCode,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.codes.Add(t[0], t[1], t[2], t[3], t[4], out) != 0;
       },
       {names::kCode}},
      {"store tokens",
       names::kTokenTable,
       {kUsername, kClientId, kScope, kRefresh, kAccess, kExpiry, kFlow, kState, kIp},
       -2,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.tokens.Add(t[0], t[1], t[2], t[3], t[4], t[5], t[6], t[7], t[8], out);
       }},
      {"issue tokens",
       names::kTokenTable,
       {kUsername, kClientId, kScope, kFlow, kState, kIp},
       -2,
       [](Stores& s, long long, const Texts& t, Json::Value& out) {
         return s.tokens.Add(t[0], t[1], t[2], t[3], t[4], t[5], out) != 0;
       },
       {names::kRefreshToken, names::kAccessToken}},
      {"write log",
       names::kLogTable,
       {{names::kMsg, 0, kAnyLength}},
       kNoCode,
       [](Stores& s, long long, const Texts& t, Json::Value&) { return s.log.Add(t[0]) != 0; }},
  };
}

std::vector<Change> allInsertions() {
  std::vector<Change> all = registrations();
  for (Change& grant : grants()) all.push_back(std::move(grant));
  return all;
}

}  // namespace

const std::vector<Change>& insertions() {
  static const std::vector<Change> all = allInsertions();
  return all;
}

const std::vector<Change>& edits() {
  static const std::vector<Change> all{
      {"edit client",
       names::kClientInfoTable,
       {kRedirect, kScope, kDisplayName},
       -2,
       [](Stores& s, long long id, const Texts& t, Json::Value&) {
         return s.clients.Edit(id, t[0], t[1], t[2]) != 0;
       }},
      {"edit code",
       names::kGrantCodeTable,
       {asGiven(kUsername), asGiven(kClientId), asGiven(kScope), asGiven(kState)},
       kNoCode,
       [](Stores& s, long long id, const Texts& t, Json::Value&) {
         return s.codes.Edit(id, t[0], t[1], t[2], t[3]) != 0;
       }},
      {"edit code and expiry",
       names::kGrantCodeTable,
       {kUsername, kClientId, kScope, asGiven(kExpiry), kState},
       kNoCode,
       [](Stores& s, long long id, const Texts& t, Json::Value&) {
         return s.codes.Edit(id, t[0], t[1], t[2], t[3], t[4]) != 0;
       }},
      {"edit tokens",
       names::kTokenTable,
       {asGiven(kUsername), asGiven(kClientId), asGiven(kScope), asGiven(kFlow), asGiven(kState)},
       -2,
       [](Stores& s, long long id, const Texts& t, Json::Value&) {
         return s.tokens.Edit(id, t[0], t[1], t[2], t[3], t[4]);
       }},
      {"edit tokens and expiry",
       names::kTokenTable,
       {kUsername, kClientId, kScope, asGiven(kExpiry), kFlow, kState},
       -2,
       [](Stores& s, long long id, const Texts& t, Json::Value&) {
         return s.tokens.Edit(id, t[0], t[1], t[2], t[3], t[4], t[5]);
       }},
  };
  return all;
}

const std::vector<LookUp>& lookUps() {
  static const std::vector<LookUp> all{
      {"client", names::kClientInfoTable, kClientId,
       [](Stores& s, const std::string& t, Json::Value* r) { return s.clients.Get(t, r) != 0; },
       [](Stores& s, const std::string& t) { return s.clients.GetIndex(t); }},
      {"code", names::kGrantCodeTable, asGiven(kCode),
       [](Stores& s, const std::string& t, Json::Value* r) { return s.codes.Get(t, r) != 0; },
       [](Stores& s, const std::string& t) { return s.codes.GetIndex(t); }},
      {"access token", names::kTokenTable, kAccess,
       [](Stores& s, const std::string& t, Json::Value* r) {
         return s.tokens.GetWithAccessToken(t, r);
       },
       [](Stores& s, const std::string& t) { return s.tokens.GetIndex(t); }},
      {"refresh token", names::kTokenTable, kRefresh,
       [](Stores& s, const std::string& t, Json::Value* r) {
         return s.tokens.GetWithRefreshToken(t, r);
       },
       nullptr},
  };
  return all;
}

}  // namespace fuzz
