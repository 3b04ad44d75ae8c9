// What the two sources of `keldoauth client` share.

#ifndef KELDOAUTH_TOOLS_CLIENT_H
#define KELDOAUTH_TOOLS_CLIENT_H

#include "tools/keldoauth/commands/access.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/present.h"

namespace tool {

/// With its secret, masked or in full.
Json::Value presentWithSecret(const KELDOAUTHSERVER::grants::Grants& grants,
                              const KELDOAUTHSERVER::grants::Application& application,
                              Secrets secrets);

Answer addClient(const Arguments& arguments);
Answer editClient(const Arguments& arguments);
Answer renewSecret(const Arguments& arguments);
Answer enableClient(const Arguments& arguments);
Answer disableClient(const Arguments& arguments);
Answer revokeClient(const Arguments& arguments);
Answer removeClient(const Arguments& arguments);

void printCredentials(const Json::Value& document, std::ostream& out);
void printSwitched(const Json::Value& document, std::ostream& out);
void printClientRevoked(const Json::Value& document, std::ostream& out);
void printClientRemoved(const Json::Value& document, std::ostream& out);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_CLIENT_H
