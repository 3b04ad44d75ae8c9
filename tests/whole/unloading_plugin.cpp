// What unloading_test.cpp loads: the library's work behind one function.

#include <json/value.h>

#include "stores/oauth_token.h"
#include "utils/oauth_names.h"

extern "C" [[gnu::visibility("default")]] void issueAndVerify(Json::Value* issued,
                                                              Json::Value* verified,
                                                              Json::Value* rows) {
  namespace names = KELDOAUTHSERVER::names;
  KELDOAUTHSERVER::OAUTHDBToken tokens(names::kTokenTable);
  tokens.Add("alice", std::string(64, 'c'), "read", "code", "state", "192.0.2.7", *issued);
  tokens.Verify((*issued)[names::kAccessToken].asString(), *verified);
  tokens.Get(rows);
}
