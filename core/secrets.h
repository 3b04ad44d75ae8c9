// The columns that are stored encrypted, and the platform's cipher behind them.

#ifndef KELDOAUTH_CORE_SECRETS_H
#define KELDOAUTH_CORE_SECRETS_H

#include <json/value.h>

namespace KELDOAUTHSERVER {

// Both convert the members "client_id" and then "client_secret" of `doc` in
// place, whatever table it is for. The first failure ends them: false, with
// the rest as it was and a line under `source`. A document without them passes.
// Throws on a member without a text form.

bool encryptSecrets(const char* source, Json::Value& doc);
bool decryptSecrets(const char* source, Json::Value& doc);

}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_CORE_SECRETS_H
