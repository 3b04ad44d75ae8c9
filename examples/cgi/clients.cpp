#include "examples/cgi/clients.h"

#include <algorithm>

#include "examples/cgi/answer.h"
#include "examples/cgi/encoding.h"
#include "stores/oauth_clientInfo.h"
#include "utils/oauth_bounds.h"
#include "utils/oauth_names.h"

namespace service {
namespace {

using namespace KELDOAUTHSERVER;

struct Credentials {
  std::string identifier;
  std::string secret;
};

[[noreturn]] void refuseClient(const std::string& why) {
  throw Refusal{oauthError(401, "invalid_client", why)
                    .with("WWW-Authenticate", R"(Basic realm="oauth", charset="UTF-8")")};
}

[[noreturn]] void refuseRequest(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_request", why)};
}

/// Identifier and secret are form-encoded before the scheme encodes them.
Credentials readBasic(const std::string& header) {
  const std::size_t blank = header.find(' ');
  if (blank == std::string::npos || !equalWords(header.substr(0, blank), "Basic")) {
    refuseClient("Only the Basic scheme is known here");
  }
  const std::size_t start = header.find_first_not_of(' ', blank);
  const std::optional<std::string> pair =
      base64Decode(start == std::string::npos ? "" : header.substr(start));
  const std::size_t colon = pair ? pair->find(':') : std::string::npos;
  if (colon == std::string::npos) refuseClient("The Authorization header cannot be read");

  const std::optional<std::string> identifier = formDecode(pair->substr(0, colon));
  const std::optional<std::string> secret = formDecode(pair->substr(colon + 1));
  if (!identifier || !secret) refuseClient("The Authorization header cannot be read");
  return {*identifier, *secret};
}

Credentials readCredentials(const Request& request, const Parameters& form) {
  const std::string identifier = form.value("client_id");
  const std::string secret = form.value("client_secret");
  if (request.authorization.empty()) return {identifier, secret};

  if (!secret.empty()) refuseRequest("More than one way of client authentication");
  Credentials credentials = readBasic(request.authorization);
  if (!identifier.empty() && identifier != credentials.identifier) {
    refuseRequest("client_id is not the one in the Authorization header");
  }
  return credentials;
}

}  // namespace

std::string undoubled(const Json::Value& text) {
  std::string single = text.asString();
  for (std::size_t at = single.find("''"); at != std::string::npos; at = single.find("''", at)) {
    single.erase(at++, 1);
  }
  return single;
}

std::string faultOfName(const std::string& name) {
  const auto isControl = [](unsigned char byte) { return byte < ' ' || byte == 0x7f; };
  constexpr std::size_t kMost = bounds::kDisplayName.max;
  if (name.size() > kMost) {
    return "The name is too long: " + std::to_string(kMost) + " bytes at most.";
  }
  if (name.find_first_not_of(' ') == std::string::npos) return "The application needs a name.";
  if (!isUtf8(name) || std::any_of(name.begin(), name.end(), isControl)) {
    return "The name has characters that cannot be shown.";
  }
  return {};
}

Client clientOf(const Json::Value& row) {
  return {number(row[names::kId].asString()),  row[names::kEnable].asString() == "1",
          undoubled(row[names::kClientId]),    undoubled(row[names::kClientSecret]),
          undoubled(row[names::kRedirectUri]), undoubled(row[names::kScope]),
          undoubled(row[names::kDisplayName])};
}

std::optional<Client> findClient(const std::string& identifier) {
  if (identifier.size() != kIdentifierLength) return std::nullopt;
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value rows;
  if (clients.Get(identifier, &rows) == 0) throw Unavailable{};
  if (rows.empty()) return std::nullopt;

  Client client = clientOf(rows[0]);
  // A row that could not be decrypted is not the one asked for.
  if (client.identifier != identifier) throw Unavailable{};
  return client;
}

Client authenticate(const Request& request, const Parameters& form) {
  const Credentials credentials = readCredentials(request, form);
  if (credentials.identifier.empty()) refuseClient("Client authentication is required");
  std::optional<Client> client = findClient(credentials.identifier);
  if (!client || !equalSecrets(credentials.secret, client->secret)) {
    refuseClient("Unknown client or wrong secret");
  }
  if (!client->enabled) refuseClient("This client has been disabled");
  return *client;
}

Parameters readForm(const Request& request, std::initializer_list<std::string_view> names) {
  if (request.method != "POST") throw Refusal{methodNotAllowed("POST")};
  if (!request.isForm()) refuseRequest("The content type must be that of a form");
  std::optional<Parameters> form = Parameters::parse(request.body);
  if (!form) refuseRequest("The form cannot be read");
  if (form->isAnyDoubled({"client_id", "client_secret"}) || form->isAnyDoubled(names)) {
    refuseRequest("A parameter occurs more than once");
  }
  return *form;
}

}  // namespace service
