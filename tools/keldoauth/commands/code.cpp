// keldoauth code: the grant codes.

#include <ostream>

#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/grants.h"
#include "tools/keldoauth/console/output.h"
#include "tools/keldoauth/console/terminal.h"
#include "tools/keldoauth/console/text.h"
#include "tools/keldoauth/storage/bounds.h"
#include "tools/keldoauth/storage/stores.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"USERNAME", names::kUsername, Width::kShrinks},
    {"CLIENT ID", names::kClientId, Width::kShrinks, identifierText},
    {"SCOPE", names::kScope, Width::kShrinks},
    {"CODE", names::kCode},
    {"EXPIRES", "expires_at", Width::kFixed, expiryText},
    {"LEFT", "expired", Width::kFixed, remainingText},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"username", names::kUsername},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"scope", names::kScope},
    {"code", names::kCode},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
    {"state", names::kState},
    {"ip", names::kIp},
};

constexpr Columns kIssuedColumns{
    {"code", names::kCode},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

std::string described(const Json::Value& code) {
  return "code " + code[names::kId].asString() + " of " +
         printable(code[names::kUsername].asString());
}

// Issuing -------------------------------------------------------------------------

bool addTo(Codes& codes, const Arguments& given, const std::string& client, Json::Value& issued) {
  const std::string ip = given.ip.value_or("");
  if (!given.expiresIn) {
    return codes.Add(*given.username, client, *given.scope, *given.state, ip, issued) != 0;
  }
  return codes.Add(*given.username, client, *given.scope, getRandomStr(kIdentifierLength),
                   expiryIn(*given.expiresIn), *given.state, ip, issued) != 0;
}

Answer issue(const Arguments& arguments) {
  const std::string client = clientToIssueFor(arguments);
  Codes codes;
  Json::Value issued;
  if (!addTo(codes, arguments, client, issued)) {
    throw refused(codes, outOfBounds({{"--username", *arguments.username, bounds::kUsername},
                                      {"--scope", *arguments.scope, bounds::kScope},
                                      {"--state", *arguments.state, bounds::kState}},
                                     arguments.ip.value_or("")));
  }
  Json::Value rows(Json::arrayValue);
  const bool isFound = codes.Get(issued[names::kCode].asString(), &rows) != 0 && !rows.empty();
  return answerRow<Codes>(isFound ? rows[0U] : issued, Secrets::kShown);
}

void printIssued(const Json::Value& document, std::ostream& out) {
  const Json::Value& code = document["code"];
  out << "Issued " << described(code) << ".\n";
  printDetails(out, code, kIssuedColumns);
}

// Looking up ----------------------------------------------------------------------

/// The row of a code, null when there is none.
Json::Value findCode(Codes& codes, const std::string& code) {
  Json::Value rows(Json::arrayValue);
  if (codes.Get(code, &rows) == 0) {
    throw libraryFailure(codes, outOfBounds({{"the code", code, bounds::kIdentifier}}));
  }
  return rows.empty() ? Json::Value() : rows[0U];
}

/// The row that ID or --code-file names.
Json::Value chosenRow(Codes& codes, const Arguments& arguments) {
  if (arguments.id.has_value() == arguments.codeFile.has_value()) {
    throw Failure(kUsage, "name the code by either ID or --code-file");
  }
  if (arguments.id) return rowById(codes, *arguments.id);
  Json::Value row = findCode(codes, readSecret(*arguments.codeFile, "Code"));
  if (row.isNull()) throw notFound(Codes::kNoun);
  return row;
}

void printCodes(const Json::Value& document, std::ostream& out) {
  printList(out, document, Codes::kPlural, kListColumns);
}

Answer show(const Arguments& arguments) {
  Codes codes;
  return answerRow<Codes>(chosenRow(codes, arguments), shownIf(arguments.reveal));
}

void printCode(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["code"], kDetailColumns);
}

// Changing ------------------------------------------------------------------------

/// The form with an expiry doubles quotes, the other one stores what it is
/// given: run last, it leaves the values that were not to change as they were.
bool store(Codes& codes, long long id, const Grant& grant, const Arguments& given) {
  const auto& [username, client, scope, state] = grant;
  if (given.expiresIn &&
      codes.Edit(id, username, client, scope, expiryIn(*given.expiresIn), state) == 0) {
    return false;
  }
  return codes.Edit(id, username, client, scope, state) != 0;
}

Answer edit(const Arguments& arguments) {
  if (!arguments.username && !arguments.client && !arguments.scope && !arguments.state &&
      !arguments.expiresIn) {
    throw Failure(kUsage, "nothing to change",
                  "--username, --client, --scope, --state or --expires-in");
  }
  const Arguments given = withClientIdentifier(arguments);
  Codes codes;
  Transaction transaction(codes);
  const Grant grant = changedGrant(rowById(codes, *given.id), given);
  if (!store(codes, *given.id, grant, given)) {
    throw refused(codes, outOfBounds({{"--username", grant.username, bounds::kUsername},
                                      {"--client", grant.client, bounds::kIdentifier},
                                      {"--scope", grant.scope, bounds::kScope},
                                      {"--state", grant.state, bounds::kState}}));
  }
  transaction.commit();
  return answerRow<Codes>(rowById(codes, *given.id), Secrets::kMasked);
}

Answer revoke(const Arguments& arguments) {
  Codes codes;
  const Json::Value row = chosenRow(codes, arguments);
  confirm(arguments, "Revoke " + described(row) + "?");
  Transaction transaction(codes);
  requireUnchanged(codes, row);
  if (codes.Revoke(idOf(row)) == 0) throw libraryFailure(codes);
  transaction.commit();
  return answerRow<Codes>(rowById(codes, idOf(row)), Secrets::kMasked);
}

void printRevoked(const Json::Value& document, std::ostream& out) {
  out << "Revoked " << described(document["code"])
      << "; it reads as expired and goes with the next purge.\n";
}

// Removing ------------------------------------------------------------------------

/// Reads, checks and removes while nobody else writes: of many that redeem a
/// code at the same moment one succeeds.
Answer redeem(const Arguments& arguments) {
  const std::string code = readSecret(arguments.codeFile.value_or("-"), "Code");
  Codes codes;
  Transaction transaction(codes);
  const Json::Value row = findCode(codes, code);
  if (row.isNull()) throw Failure(kInvalid, "code is unknown or was redeemed before");
  if (Codes::isExpired(expiryOf(row), currentTime())) throw Failure(kInvalid, "code is expired");
  removeSeen(codes, row);
  transaction.commit();
  return answerRow<Codes>(row, Secrets::kMasked);
}

void printRedeemed(const Json::Value& document, std::ostream& out) {
  out << "Redeemed " << described(document["code"]) << ".\n";
  printCode(document, out);
}

Answer remove(const Arguments& arguments) {
  Codes codes;
  const Json::Value row = chosenRow(codes, arguments);
  confirm(arguments, "Remove " + described(row) + "?");
  removeUnchanged(codes, row);
  return answerRow<Codes>(row, Secrets::kMasked);
}

void printRemoved(const Json::Value& document, std::ostream& out) {
  out << "Removed " << described(document["code"]) << ".\n";
}

void printPurgedCodes(const Json::Value& document, std::ostream& out) {
  printPurged(document, Codes::kNoun, kListColumns, out);
}

}  // namespace

const std::vector<Command>& codeCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"issue",
       "Issue a code",
       {required(kClient), required(kUsername), required(kScope), required(kState), kIp, kExpiresIn,
        kJson},
       issue,
       printIssued},
      {"list",
       "List codes",
       {kOfClient, kOfUser, kExpired, kReveal, kJson},
       listGrants<Codes>,
       printCodes},
      {"show", "Show one code", {kId, kCodeFile, kReveal, kJson}, show, printCode},
      {"edit",
       "Change what a code was granted for",
       {required(kId), kClient, kUsername, kScope, kState, kNewExpiry, kJson},
       edit,
       printCode},
      {"redeem",
       "Take a valid code out, once: read from standard input or a file",
       {kCodeFile, kJson},
       redeem,
       printRedeemed},
      {"revoke", "Let a code expire now", {kId, kCodeFile, kYes, kJson}, revoke, printRevoked},
      {"remove", "Remove a code", {kId, kCodeFile, kYes, kJson}, remove, printRemoved},
      {"purge",
       "Remove expired codes",
       {kGrace, kDryRun, kReveal, kYes, kJson},
       purgeGrants<Codes>,
       printPurgedCodes},
  };
  return commands;
}

}  // namespace tool
