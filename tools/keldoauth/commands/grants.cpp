#include "tools/keldoauth/commands/grants.h"

#include <iostream>

namespace names = KELDOAUTHSERVER::names;

namespace tool {

void printPurged(const Json::Value& document, const std::string& noun, const Columns& columns,
                 std::ostream& out) {
  const Json::Value& rows = document["purged"];
  if (rows.empty()) {
    out << "Nothing to purge.\n";
    return;
  }
  printTable(out, rows, columns);
  out << counted(rows.size(), "expired " + noun)
      << (document["dry_run"].asBool() ? " would be purged.\n" : " purged.\n");
}

std::string clientToIssueFor(const Arguments& arguments) {
  const Json::Value client = requireClient(*arguments.client);
  if (client[names::kEnable] != "1") {
    std::cerr << "keldoauth: note: client " << client[names::kId].asString() << " is disabled\n";
  }
  return readableIdentifier(client);
}

Arguments withClientIdentifier(const Arguments& arguments) {
  Arguments given = arguments;
  if (given.client) given.client = readableIdentifier(requireClient(*given.client));
  return given;
}

Grant changedGrant(const Json::Value& row, const Arguments& given) {
  const auto newOrOld = [&row](const Arguments::Text& value, const char* column) {
    return value.value_or(row[column].asString());
  };
  return {newOrOld(given.username, names::kUsername), newOrOld(given.client, names::kClientId),
          newOrOld(given.scope, names::kScope), newOrOld(given.state, names::kState)};
}

std::string expiryIn(long long seconds) {
  return std::to_string(currentTime() + seconds);
}

}  // namespace tool
