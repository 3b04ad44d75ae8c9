// What the two sources of `keldoauth token` share.

#ifndef KELDOAUTH_TOOLS_TOKEN_H
#define KELDOAUTH_TOOLS_TOKEN_H

#include <json/value.h>

#include <string>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/grants.h"
#include "tools/keldoauth/storage/stores.h"

namespace tool {

/// GetWithAccessToken or GetWithRefreshToken.
using TokenLookup = bool (KELDOAUTHSERVER::OAUTHDBToken::*)(const std::string&, Json::Value*);

/// The row of a token, null when there is none.
Json::Value findToken(Tokens& tokens, TokenLookup lookup, const std::string& token);

/// Which value a store of tokens does not accept; empty when none is at fault.
std::string faultInToken(const Grant& grant, const std::string& flowType,
                         const std::string& ip = {});

Answer issueToken(const Arguments& arguments);
Answer refreshToken(const Arguments& arguments);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_TOKEN_H
