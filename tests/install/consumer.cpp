// A program of somebody else's: includes every installed header and calls into
// each store.

#include <json/value.h>

#include <cstdio>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

int main() {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value client;
  if (clients.Add("https://a.example/cb", "read", "Consumer", client) == 0) {
    std::fprintf(stderr, "%d %s\n", clients.GetErrCode(), clients.GetErrMsg().c_str());
    return 1;
  }
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  OAUTHDBToken tokens(names::kTokenTable);
  OAUTHDBLog log(names::kLogTable);
  Json::Value entries;
  const bool complete = codes.Purge() != 0 && tokens.Purge() && log.Get("", "", &entries) != 0 &&
                        entries.size() == 1 && getRandomStr(64).size() == 64;
  return complete && log.GetErrCode() == errors::kNone.code ? 0 : 1;
}
