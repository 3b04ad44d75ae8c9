// Which application, code or token a command is about.

#ifndef KELDOAUTH_TOOLS_CHOSEN_H
#define KELDOAUTH_TOOLS_CHOSEN_H

#include <string>
#include <vector>

#include "grants/grants.h"
#include "tools/keldoauth/console/failure.h"
#include "tools/keldoauth/console/options.h"

namespace tool {

/// The application that `text` names: by its identifier, a row id (digits are
/// always one) or its name. Throws kNotFound, and kUsage, with the list of them,
/// for a name that several have.
KELDOAUTHSERVER::grants::Application chosenClient(const KELDOAUTHSERVER::grants::Grants& grants,
                                                  const std::string& text);

/// The same for a command that changes it. Throws kUnavailable when its
/// identifier cannot be decrypted: nothing can be done in its name.
KELDOAUTHSERVER::grants::Application readableClient(const KELDOAUTHSERVER::grants::Grants& grants,
                                                    const std::string& text);

/// The identifier alone. One is taken as it is: codes and tokens of other
/// programs may outlive their application.
KELDOAUTHSERVER::grants::ApplicationId chosenIdentifier(
    const KELDOAUTHSERVER::grants::Grants& grants, const std::string& text);

/// What --username and --client leave.
KELDOAUTHSERVER::grants::AccessFilter filterOf(const KELDOAUTHSERVER::grants::Grants& grants,
                                               const Arguments& arguments);

using Table = KELDOAUTHSERVER::grants::AccessHandle::Table;

/// "code" or "token".
const char* nounOf(Table table);

/// Whether a command names rows by id, and whether by a file.
bool namesFile(const Arguments& arguments);

/// The one row that an id, --code-file, --token-file or --refresh-token-file
/// names. Throws kUsage unless exactly one of them was given, and kNotFound.
KELDOAUTHSERVER::grants::AccessEntry chosenEntry(const KELDOAUTHSERVER::grants::Grants& grants,
                                                 Table table, const Arguments& arguments);

/// The rows of several ids. Throws kNotFound for the first that is none.
std::vector<KELDOAUTHSERVER::grants::AccessEntry> chosenEntries(
    const KELDOAUTHSERVER::grants::Grants& grants, Table table, const Arguments::Numbers& ids);

/// As readSecret() in console/terminal.h; throws kRefused for an empty text.
std::string readShown(const std::string& path, const std::string& what);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_CHOSEN_H
