#include "tools/keldoauth/commands/chosen.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <set>
#include <system_error>

#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/encrypted_values.h"

using namespace KELDOAUTHSERVER;
using grants::AccessEntry;
using grants::AccessFilter;
using grants::Application;
using grants::ApplicationId;
using grants::Grants;

namespace tool {
namespace {

bool isNumber(const std::string& text) {
  return !text.empty() &&
         std::all_of(text.begin(), text.end(), [](char c) { return '0' <= c && c <= '9'; });
}

std::optional<long long> rowId(const std::string& text) {
  long long id = 0;
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), id);
  return error == std::errc() ? std::optional<long long>(id) : std::nullopt;
}

Application clientInRow(const Grants& grants, const std::string& text) {
  const auto id = rowId(text);
  for (Application& application : grants.applications.all()) {
    if (application.row == id) return application;
  }
  throw notFound("client " + text);
}

/// Names the few that a name could mean, so that one can be picked.
Failure ambiguous(const std::string& name, const std::vector<Application>& found) {
  std::string rows;
  for (const Application& application : found) {
    rows += (rows.empty() ? "" : ", ") + std::to_string(application.row) + " (" +
            masked(application.identifier.text()) + ")";
  }
  return {kUsage, std::to_string(found.size()) + " clients are named " + name,
          "name one by its row id: " + rows};
}

Application clientNamed(const Grants& grants, const std::string& name) {
  const std::vector<Application> found = grants.applications.named(grants::ApplicationName(name));
  if (found.empty()) throw notFound("client");
  if (found.size() > 1) throw ambiguous(name, found);
  return found.front();
}

AccessEntry entryInFile(const Grants& grants, const Arguments& arguments) {
  std::optional<AccessEntry> entry;
  if (arguments.codeFile) {
    entry = grants.access.find(grants::Code(readShown(*arguments.codeFile, "Code")));
  } else if (arguments.tokenFile) {
    entry = grants.access.find(grants::AnyToken(readShown(*arguments.tokenFile, "Access token")));
  } else {
    entry = grants.access.find(
        grants::AnyToken(readShown(*arguments.refreshTokenFile, "Refresh token")));
  }
  if (!entry) throw notFound(nounOf(arguments.codeFile ? Table::kCodes : Table::kTokens));
  return *entry;
}

}  // namespace

Application chosenClient(const Grants& grants, const std::string& text) {
  if (text.empty()) throw Failure(kUsage, "CLIENT is an identifier, a row id or a name");
  if (isDecrypted(text)) {
    if (const auto found = grants.applications.find(ApplicationId(text))) return *found;
  } else if (isNumber(text)) {
    return clientInRow(grants, text);
  }
  return clientNamed(grants, text);
}

Application readableClient(const Grants& grants, const std::string& text) {
  Application application = chosenClient(grants, text);
  if (isDecrypted(application.identifier.text())) return application;
  throw Failure(
      kUnavailable,
      "client " + std::to_string(application.row) + ": its identifier cannot be decrypted",
      adviceOnCipher());
}

ApplicationId chosenIdentifier(const Grants& grants, const std::string& text) {
  const bool isName = !grants.applications.named(grants::ApplicationName(text)).empty();
  if (isDecrypted(text) && !isName) return ApplicationId(text);
  return readableClient(grants, text).identifier;
}

AccessFilter filterOf(const Grants& grants, const Arguments& arguments) {
  AccessFilter filter;
  if (arguments.username) filter.user = grants::User(*arguments.username);
  if (arguments.client) filter.application = chosenIdentifier(grants, *arguments.client);
  return filter;
}

const char* nounOf(Table table) {
  return table == Table::kCodes ? "code" : "token";
}

bool namesFile(const Arguments& arguments) {
  return arguments.codeFile || arguments.tokenFile || arguments.refreshTokenFile;
}

AccessEntry chosenEntry(const Grants& grants, Table table, const Arguments& arguments) {
  const int files = static_cast<int>(arguments.codeFile.has_value()) +
                    static_cast<int>(arguments.tokenFile.has_value()) +
                    static_cast<int>(arguments.refreshTokenFile.has_value());
  if (files + static_cast<int>(arguments.id.has_value()) != 1) {
    throw Failure(kUsage, table == Table::kCodes ? "name the code by either ID or --code-file"
                                                 : "name the token by one of ID, --token-file and "
                                                   "--refresh-token-file");
  }
  if (files > 0) return entryInFile(grants, arguments);
  return chosenEntries(grants, table, {*arguments.id}).front();
}

std::vector<AccessEntry> chosenEntries(const Grants& grants, Table table,
                                       const Arguments::Numbers& ids) {
  AccessFilter everything;
  everything.withDead = true;
  everything.withSpent = true;
  const std::vector<AccessEntry> all = grants.access.list(everything);
  std::vector<AccessEntry> chosen;
  for (const long long id : std::set<long long>(ids.begin(), ids.end())) {
    const auto found = std::find_if(all.begin(), all.end(), [&](const AccessEntry& entry) {
      return entry.handle.table == table && entry.handle.row == id;
    });
    if (found == all.end()) throw notFound(nounOf(table) + (" " + std::to_string(id)));
    chosen.push_back(*found);
  }
  return chosen;
}

std::string readShown(const std::string& path, const std::string& what) {
  std::string text = readSecret(path, what);
  if (text.empty()) throw Failure(kRefused, what + ": the text is empty");
  return text;
}

}  // namespace tool
