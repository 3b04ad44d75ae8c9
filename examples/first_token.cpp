// The whole flow on one screen: register an application, issue a grant code,
// redeem it once, issue a token pair for it and verify the access token.

#include <json/value.h>

#include <cstdio>
#include <string>

#include "core/oauth_db_basic.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace {

int fail(const char* step, const OAUTHDBBasic& store) {
  std::fprintf(stderr, "%s failed: %d %s\n", step, store.GetErrCode(), store.GetErrMsg().c_str());
  return 1;
}

}  // namespace

int main() {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value client;
  if (clients.Add("https://photos.example.org/callback", "profile photos.read", "Photo Frame",
                  client) == 0) {
    return fail("registering", clients);
  }
  const std::string clientId = client[names::kClientId].asString();

  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  Json::Value issued;
  if (codes.Add("alice", clientId, "photos.read", "af0ifjsldkj", getRemoteIP(), issued) == 0) {
    return fail("issuing a code", codes);
  }

  // Only the request whose deletion succeeds may go on to issue a token.
  Json::Value redeem;
  redeem[names::kCondition][names::kCode] = issued[names::kCode];
  if (!codes.DBDel(redeem)) return fail("redeeming", codes);

  OAUTHDBToken tokens(names::kTokenTable);
  Json::Value pair;
  if (tokens.Add("alice", clientId, "photos.read", "authorization_code", "af0ifjsldkj", "", pair) ==
      0) {
    return fail("issuing a token", tokens);
  }
  Json::Value holder;
  if (!tokens.Verify(pair[names::kAccessToken].asString(), holder)) {
    return fail("verifying", tokens);
  }
  std::printf("%s may %s\n", holder[names::kUsername].asCString(),
              holder[names::kScope].asCString());
  return 0;
}
