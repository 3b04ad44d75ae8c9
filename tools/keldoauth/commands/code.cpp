// keldoauth code: the grant codes.

#include <ostream>

#include "tools/keldoauth/commands/access.h"
#include "tools/keldoauth/commands/command.h"
#include "tools/keldoauth/commands/edit.h"
#include "tools/keldoauth/commands/present.h"
#include "tools/keldoauth/console/output.h"
#include "utils/oauth_names.h"

using namespace KELDOAUTHSERVER;
using grants::Grants;

namespace tool {
namespace {

constexpr Columns kListColumns{
    {"ID", names::kId},
    {"USERNAME", names::kUsername, Width::kShrinks, userText},
    {"CLIENT", "client_name", Width::kShrinks, clientText},
    {"SCOPE", names::kScope, Width::kShrinks},
    {"EXPIRES", "expires_at", Width::kFixed, expiryText},
    {"LEFT", "expired", Width::kFixed, remainingText},
};

constexpr Columns kDetailColumns{
    {"id", names::kId},
    {"username", names::kUsername, Width::kFixed, userText},
    {"client", "client_name", Width::kFixed, clientText},
    {"client id", names::kClientId, Width::kFixed, identifierText},
    {"scope", names::kScope},
    {"issued", "since", Width::kFixed, sinceText},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
    {"state", names::kState},
    {"ip", names::kIp},
    {"stored by", "foreign", Width::kFixed, foreignText},
};

constexpr Columns kIssuedColumns{
    {"code", names::kCode},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

constexpr Columns kPairColumns{
    {"access token", names::kAccessToken},
    {"refresh token", names::kRefreshToken},
    {"expires", "expires_at", Width::kFixed, expiryAndRemainingText},
};

// Issuing and redeeming -------------------------------------------------------------

/// The one address of --redirect-uri, if there is one.
std::optional<grants::RedirectAddress> redirectOf(const Arguments& arguments) {
  if (arguments.redirectUris.empty()) return {};
  if (arguments.redirectUris.size() == 1) {
    return grants::RedirectAddress(arguments.redirectUris.front());
  }
  throw Failure(kUsage, "a code has one --redirect-uri");
}

/// The administrator hands the code over: no challenge is needed.
grants::CodeRequest requestOf(const Arguments& arguments, const grants::ApplicationId& client) {
  const auto redirect = redirectOf(arguments);
  grants::CodeRequest request{grants::User(*arguments.username), client,
                              grants::Scope(*arguments.scope),
                              redirect.value_or(grants::RedirectAddress())};
  request.named = redirect ? grants::AddressNamed::kInRequest : grants::AddressNamed::kImplied;
  request.text = grants::CallerText(arguments.state.value_or(""));
  request.from = grants::PeerAddress(arguments.ip.value_or(""));
  request.lifetime = arguments.expiresIn;
  request.waivesPkce = true;
  return request;
}

Answer issue(const Arguments& arguments) {
  Grants grants;
  const auto client = readableClient(grants, *arguments.client).identifier;
  const auto issued = grants.codes.issue(requestOf(arguments, client));
  if (!issued) throw refusedRequest(issued.refusal(), faultInGrant(arguments));
  Answer answer;
  Json::Value& code = answer.document["code"];
  try {
    if (const auto entry = grants.access.find(issued->code)) code = present(*entry);
  } catch (const grants::Trouble&) {
    code[names::kId] = Json::Value();  // the code is told whatever becomes of its row
  }
  code[names::kCode] = issued->code.text();
  return answer;
}

void printIssued(const Json::Value& document, std::ostream& out) {
  const Json::Value& code = document["code"];
  out << "Issued " << describedAccess(code) << ".\n";
  printDetails(out, code, kIssuedColumns);
}

/// In the name of the application that it was issued to.
Answer redeem(const Arguments& arguments) {
  const grants::Code code(readShown(arguments.codeFile.value_or("-"), "Code"));
  grants::Redemption redemption;
  redemption.code = code;
  redemption.redirect = redirectOf(arguments);
  if (arguments.verifierFile) {
    redemption.verifier = grants::Verifier(readShown(*arguments.verifierFile, "Verifier"));
  }
  Grants grants;
  const auto entry = grants.access.find(code);
  if (!entry) throw notGood("the code", {grants::Error::kInvalidGrant, grants::Why::kUnknown});
  redemption.application = entry->application;
  redemption.from = entry->from;
  const auto pair = grants.codes.redeem(redemption);
  if (!pair) throw notGood("the code", pair.refusal());
  Answer answer;
  answer.document["code"] = present(*entry);
  answer.document["token"] = presentPair(grants, *pair);
  return answer;
}

void printRedeemed(const Json::Value& document, std::ostream& out) {
  out << "Redeemed " << describedAccess(document["code"]) << ".\n";
  printDetails(out, document["code"], kDetailColumns);
  out << "\nIssued " << describedAccess(document["token"]) << ".\n";
  printDetails(out, document["token"], kPairColumns);
}

// For the table ---------------------------------------------------------------------

void printCodes(const Json::Value& document, std::ostream& out) {
  printList(out, document, "codes", kListColumns);
}

void printCode(const Json::Value& document, std::ostream& out) {
  printDetails(out, document["code"], kDetailColumns);
}

Answer list(const Arguments& arguments) {
  return listAccess(Table::kCodes, arguments);
}

Answer show(const Arguments& arguments) {
  return showAccess(Table::kCodes, arguments);
}

Answer revoke(const Arguments& arguments) {
  return revokeAccess(Table::kCodes, arguments);
}

Answer remove(const Arguments& arguments) {
  return removeAccess(Table::kCodes, arguments);
}

Answer purge(const Arguments& arguments) {
  return purgeAccess(Table::kCodes, arguments);
}

void printRevoked(const Json::Value& document, std::ostream& out) {
  printEnded(Table::kCodes, "Revoked", document, out);
}

void printRemoved(const Json::Value& document, std::ostream& out) {
  printEnded(Table::kCodes, "Removed", document, out);
}

void printPurgedCodes(const Json::Value& document, std::ostream& out) {
  printPurged(Table::kCodes, kListColumns, document, out);
}

}  // namespace

const std::vector<Command>& codeCommands() {
  using namespace option;
  static const std::vector<Command> commands{
      {"issue",
       "Issue a code",
       {required(kClient), required(kUsername), required(kScope), kCodesRedirectUri, kState, kIp,
        kExpiresIn, kJson},
       issue,
       printIssued},
      {"list", "List codes", {kOfClient, kOfUser, kExpired, kRedeemed, kJson}, list, printCodes},
      {"show", "Show one code", {kId, kCodeFile, kJson}, show, printCode},
      {"edit",
       "Change what another program's code was granted for",
       {required(kId), kClient, kUsername, kScope, kNewState, kNewExpiry, kJson},
       editCode,
       printCode},
      {"redeem",
       "Redeem a code, once, for tokens: read from standard input or a file",
       {kCodeFile, kCodesRedirectUri, kVerifierFile, kJson},
       redeem,
       printRedeemed},
      {"revoke",
       "End codes",
       {kIds, kCodeFile, kOfUser, kOfClient, kAll, kYes, kJson},
       revoke,
       printRevoked},
      {"remove",
       "Delete rows of codes, dead and redeemed ones too",
       {kIds, kCodeFile, kYes, kJson},
       remove,
       printRemoved},
      {"purge", "Delete expired codes", {kGrace, kDryRun, kYes, kJson}, purge, printPurgedCodes},
  };
  return commands;
}

}  // namespace tool
