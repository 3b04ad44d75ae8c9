#include "tools/keldoauth/commands/edit.h"

#include <string>

#include "core/transaction.h"
#include "grants/grants.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tools/keldoauth/commands/chosen.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/bounds.h"
#include "tools/keldoauth/console/clock.h"
#include "tools/keldoauth/storage/trouble.h"
#include "utils/clock.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::Grants;

namespace tool {
namespace {

/// What both kinds of row say about the grant, as the row has it.
struct Values {
  std::string username;
  std::string client;
  std::string scope;
  std::string state;
  std::string flowType;  // of a token
};

bool isChange(const Arguments& given) {
  return given.username || given.client || given.scope || given.state || given.flowType ||
         given.expiresIn;
}

Values changed(const Json::Value& row, const Arguments& given) {
  const auto newOrOld = [&row](const Arguments::Text& value, const char* column) {
    return value ? *value : row[column].asString();
  };
  return {newOrOld(given.username, names::kUsername), newOrOld(given.client, names::kClientId),
          newOrOld(given.scope, names::kScope), newOrOld(given.state, names::kState),
          newOrOld(given.flowType, names::kFlowType)};
}

std::string faultIn(const Values& values, const Arguments& given) {
  return outOfBounds({{"--username", values.username, bounds::kUsername},
                      {"--client", values.client, bounds::kIdentifier},
                      {"--scope", values.scope, bounds::kScope},
                      {"--state", values.state, bounds::kState},
                      {"--flow-type", given.flowType.value_or("-"), bounds::kFlowType}});
}

std::string expiryIn(long long seconds) {
  return std::to_string(currentTime() + seconds);
}

// The form with an expiry doubles quotes, the other one stores what it is
// given: run last, it leaves the values that were not to change as they were.

bool edit(OAUTHDBGrantCode& codes, long long id, const Values& to,
          const Arguments::Number& lifetime) {
  const auto& [username, client, scope, state, flowType] = to;
  if (lifetime && codes.Edit(id, username, client, scope, expiryIn(*lifetime), state) == 0) {
    return false;
  }
  return codes.Edit(id, username, client, scope, state) != 0;
}

bool edit(OAUTHDBToken& tokens, long long id, const Values& to, const Arguments::Number& lifetime) {
  const auto& [username, client, scope, state, flowType] = to;
  if (lifetime && !tokens.Edit(id, username, client, scope, expiryIn(*lifetime), flowType, state)) {
    return false;
  }
  return tokens.Edit(id, username, client, scope, flowType, state);
}

/// While nobody else writes.
void requireForeign(const Grants& grants, Table table, long long id) {
  if (chosenEntries(grants, table, {id}).front().isForeign) return;
  throw Failure(kRefused,
                nounOf(table) + (" " + std::to_string(id)) +
                    " was issued by this service, and "
                    "says what was agreed to",
                std::string("end it ('keldoauth ") + nounOf(table) + " revoke " +
                    std::to_string(id) + "'), and issue another");
}

template <typename Store>
void editForeign(Store& store, const Grants& grants, Table table, const Arguments& given) {
  requireReady(store);
  Transaction transaction(store);
  if (!transaction.Begin()) throw libraryFailure(store);
  requireForeign(grants, table, *given.id);
  Json::Value rows(Json::arrayValue);
  if (!store.Get(*given.id, &rows) || rows.empty()) throw libraryFailure(store);
  const Values values = changed(rows[0U], given);
  if (!edit(store, *given.id, values, given.expiresIn)) {
    throw libraryFailure(store, faultIn(values, given));
  }
  if (!transaction.Commit()) throw libraryFailure(store);
}

template <typename Store>
Answer editRow(const char* tableName, Table table, const Arguments& arguments) {
  if (!isChange(arguments)) {
    throw Failure(kUsage, "nothing to change", "'--help' lists what can be changed");
  }
  const Grants grants;
  chosenEntries(grants, table, {*arguments.id});
  Arguments given = arguments;
  if (given.client) given.client = readableClient(grants, *given.client).identifier.text();
  Store store(tableName);
  editForeign(store, grants, table, given);
  Answer answer;
  answer.document[nounOf(table)] = present(chosenEntries(grants, table, {*given.id}).front());
  return answer;
}

}  // namespace

Answer editCode(const Arguments& arguments) {
  return editRow<OAUTHDBGrantCode>(names::kGrantCodeTable, Table::kCodes, arguments);
}

Answer editToken(const Arguments& arguments) {
  return editRow<OAUTHDBToken>(names::kTokenTable, Table::kTokens, arguments);
}

}  // namespace tool
