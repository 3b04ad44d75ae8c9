// The options of all sub-commands, each described once. A command's table lists
// those that it takes.

#ifndef KELDOAUTH_TOOLS_OPTIONS_H
#define KELDOAUTH_TOOLS_OPTIONS_H

#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "grants/texts.h"
#include "utils/oauth_bounds.h"

namespace CLI {
class App;
}

namespace tool {

/// What the command line said. A value that was not given is absent.
struct Arguments {
  using Text = std::optional<std::string>;
  using Number = std::optional<long long>;
  using Texts = std::vector<std::string>;
  using Numbers = std::vector<long long>;

  bool all = false;
  bool disabled = false;
  bool dryRun = false;
  bool expired = false;
  bool isPublic = false;
  bool json = false;
  bool noRedirectUri = false;
  bool redeemed = false;
  bool reveal = false;
  bool yes = false;

  Number id;
  Number expiresIn;
  Number grace;
  Number last;

  Numbers ids;

  Text client;
  Text clientId;
  Text codeFile;
  Text contains;
  Text displayName;
  Text engine;
  Text file;
  Text flowType;
  Text ip;
  Text message;
  Text pkce;
  Text refreshTokenFile;
  Text scope;
  Text secretFile;
  Text since;
  Text state;
  Text tokenFile;
  Text until;
  Text username;
  Text verifierFile;

  Texts logoutUris;
  Texts redirectUris;
};

/// One option. A name without dashes is a positional argument.
struct Option {
  const char* name;
  const char* placeholder;
  const char* help;
  std::variant<bool Arguments::*, Arguments::Text Arguments::*, Arguments::Number Arguments::*,
               Arguments::Texts Arguments::*, Arguments::Numbers Arguments::*>
      target;
  bool isRequired = false;
  long long highest = 9223372036854775807;          // of a number
  const KELDOAUTHSERVER::Bounds* bounds = nullptr;  // of a text, for the help
};

constexpr Option required(Option option) {
  option.isRequired = true;
  return option;
}

constexpr Option bounded(Option option, const KELDOAUTHSERVER::Bounds& bounds) {
  option.bounds = &bounds;
  return option;
}

namespace option {

namespace bounds = KELDOAUTHSERVER::bounds;

constexpr long long kCentury = 3155760000;  // seconds

inline constexpr Option kJson{"--json", "", "Write one JSON document to standard output",
                              &Arguments::json};
inline constexpr Option kReveal{"--reveal", "", "Show secrets in full", &Arguments::reveal};
inline constexpr Option kYes{"--yes,-y", "", "Do not ask", &Arguments::yes};

inline constexpr Option kId{"ID", "", "Row id, as 'list' shows it", &Arguments::id};
inline constexpr Option kIds{"ID", "", "Row ids, as 'list' shows them", &Arguments::ids};
inline constexpr Option kClientArgument{"CLIENT", "", "Identifier, row id or name",
                                        &Arguments::client};
inline constexpr Option kUserArgument{"NAME", "", "A user", &Arguments::username};
inline constexpr Option kBackupFile{"FILE", "", "A copy of the database", &Arguments::file};
inline constexpr Option kEngine{"ENGINE", "", "sqlite or postgresql", &Arguments::engine};
inline constexpr Option kMessage{"MESSAGE", "", "Text of the entry", &Arguments::message};

inline constexpr Option kClient{"--client", "CLIENT", "Client: identifier, row id or name",
                                &Arguments::client};
inline constexpr Option kClientId =
    bounded({"--client-id", "TEXT", "Identifier instead of a generated one", &Arguments::clientId},
            bounds::kIdentifier);
inline constexpr Option kSecretFile =
    bounded({"--secret-file", "FILE",
             "Read a secret from FILE ('-': standard input) instead of generating one",
             &Arguments::secretFile},
            bounds::kIdentifier);
inline constexpr Option kRedirectUri{"--redirect-uri", "URI",
                                     "Redirect address with its scheme; may be given several times",
                                     &Arguments::redirectUris};
inline constexpr Option kNoRedirectUri{"--no-redirect-uri", "",
                                       "No redirect address: it only acts for itself",
                                       &Arguments::noRedirectUri};
inline constexpr Option kLogoutUri{"--logout-uri", "URI",
                                   "Where users may be sent after logging out; several times, too",
                                   &Arguments::logoutUris};
inline constexpr Option kPublic{"--public", "", "It has no secret: its users hold all its code",
                                &Arguments::isPublic};
inline constexpr Option kPkce{"--pkce", "required|optional",
                              "Whether it must ask for codes with a challenge (RFC 7636)",
                              &Arguments::pkce};
inline constexpr Option kScope =
    bounded({"--scope", "TEXT", "Scope", &Arguments::scope}, bounds::kScope);
inline constexpr Option kDisplayName =
    bounded({"--name", "TEXT", "Name", &Arguments::displayName}, bounds::kDisplayName);
inline constexpr Option kDisabled{"--disabled", "", "Register it switched off",
                                  &Arguments::disabled};

inline constexpr Option kUsername =
    bounded({"--username", "NAME", "User who granted it", &Arguments::username}, bounds::kUsername);
inline constexpr Option kState =
    bounded({"--state", "TEXT", "A text that goes along", &Arguments::state},
            KELDOAUTHSERVER::grants::kCallerTextBounds);
inline constexpr Option kNewState =
    bounded({"--state", "TEXT", "State of the request", &Arguments::state}, bounds::kState);
inline constexpr Option kFlow{"--flow-type", "TEXT",
                              "authorization_code: a user's login (the default); "
                              "client_credentials: for the client itself",
                              &Arguments::flowType};
inline constexpr Option kNewFlowType =
    bounded({"--flow-type", "TEXT", "Grant flow", &Arguments::flowType}, bounds::kFlowType);
inline constexpr Option kCodesRedirectUri{"--redirect-uri", "URI",
                                          "Redirect address that the code was asked with",
                                          &Arguments::redirectUris};
inline constexpr Option kVerifierFile{"--verifier-file", "FILE",
                                      "Read the verifier of the code's challenge from FILE",
                                      &Arguments::verifierFile};
inline constexpr Option kIp{"--ip", "ADDRESS", "IPv4 or IPv6 address of the requester",
                            &Arguments::ip};
inline constexpr Option kExpiresIn{
    "--expires-in",        "SECONDS", "Lifetime from now on instead of the one in the settings",
    &Arguments::expiresIn, false,     kCentury};
inline constexpr Option kNewExpiry{
    "--expires-in",        "SECONDS", "Let it expire so long from now",
    &Arguments::expiresIn, false,     kCentury};

inline constexpr Option kCodeFile{
    "--code-file", "FILE", "Read the code from FILE ('-': standard input)", &Arguments::codeFile};
inline constexpr Option kTokenFile{"--token-file", "FILE",
                                   "Read the access token from FILE ('-': standard input)",
                                   &Arguments::tokenFile};
inline constexpr Option kRefreshTokenFile{"--refresh-token-file", "FILE",
                                          "Read the refresh token from FILE ('-': standard input)",
                                          &Arguments::refreshTokenFile};

inline constexpr Option kOfUser{"--username", "NAME", "Only those of this user",
                                &Arguments::username};
inline constexpr Option kOfClient{"--client", "CLIENT",
                                  "Only those of this client (identifier, row id or name)",
                                  &Arguments::client};
inline constexpr Option kAll{"--all", "", "All that there are", &Arguments::all};
inline constexpr Option kRedeemed{"--redeemed", "", "Also those that were redeemed",
                                  &Arguments::redeemed};
inline constexpr Option kExpired{"--expired", "", "Only expired ones", &Arguments::expired};
inline constexpr Option kDryRun{"--dry-run", "", "List what would go and keep it",
                                &Arguments::dryRun};
inline constexpr Option kGrace{
    "--grace",         "SECONDS", "Keep what has been dead for less than this",
    &Arguments::grace, false,     kCentury};

inline constexpr Option kContains{"--contains", "TEXT",
                                  "Only messages with TEXT in them ('%' and '_' are wildcards)",
                                  &Arguments::contains};
inline constexpr Option kSince{
    "--since", "WHEN", "Only from then on: 1h, 2d, or 2026-01-31T08:15 (UTC)", &Arguments::since};
inline constexpr Option kUntil{"--until", "WHEN", "Only up to then", &Arguments::until};
inline constexpr Option kLast{"--last", "COUNT", "Only the newest COUNT entries", &Arguments::last};

}  // namespace option

/// Adds `option` to `app`; what is parsed goes into `arguments`.
void declare(const Option& option, CLI::App& app, Arguments& arguments);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_OPTIONS_H
