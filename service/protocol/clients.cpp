#include "service/protocol/clients.h"

#include <algorithm>

#include "service/text/encoding.h"
#include "utils/oauth_bounds.h"

namespace keldoauth::service {
namespace {

using namespace KELDOAUTHSERVER;

Answer unauthenticated(const std::string& why) {
  return oauthError(401, grants::codeText(grants::Error::kInvalidClient), why)
      .with("WWW-Authenticate", R"(Basic realm="oauth", charset="UTF-8")");
}

[[noreturn]] void refuseClient(const std::string& why) {
  throw Refusal{unauthenticated(why)};
}

[[noreturn]] void refuseRequest(const std::string& why) {
  throw Refusal{oauthError(400, "invalid_request", why)};
}

std::optional<grants::Secret> secretOf(const std::string& text) {
  return text.empty() ? std::nullopt : std::make_optional(grants::Secret(text));
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
  return {grants::ApplicationId(*identifier), secretOf(*secret)};
}

/// Of a character of three bytes, as all of those below are; 0 for any other.
unsigned codePoint(std::string_view character) {
  if (character.size() != 3) return 0;
  unsigned point = 0;
  for (const char byte : character) point = point << 6U | (static_cast<unsigned char>(byte) & 63U);
  return point & 0xFFFFU;
}

/// Characters with which a name could show as another one, or not at all: those that
/// override the direction of what follows, that break lines, that nobody sees.
bool hidesOrTurns(std::string_view name) {
  while (!name.empty()) {
    const std::size_t length = std::max<std::size_t>(1, characterLength(name));
    const unsigned point = codePoint(name.substr(0, length));
    if ((point >= 0x2028 && point <= 0x202E) || (point >= 0x2066 && point <= 0x2069) ||
        point == 0x200B || point == 0x2060 || point == 0xFEFF) {
      return true;
    }
    name.remove_prefix(length);
  }
  return false;
}

}  // namespace

std::string faultOfName(const std::string& name) {
  constexpr std::size_t kMost = bounds::kDisplayName.max;
  if (name.size() > kMost) {
    return "The name is too long: " + std::to_string(kMost) + " bytes at most.";
  }
  if (name.find_first_not_of(' ') == std::string::npos) return "The application needs a name.";
  if (!isUtf8(name) || hidesOrTurns(name) || std::any_of(name.begin(), name.end(), isControl)) {
    return "The name has characters that cannot be shown.";
  }
  return {};
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

Credentials readCredentials(const Request& request, const Parameters& form) {
  const grants::ApplicationId identifier(form.value("client_id"));
  Credentials credentials{identifier, secretOf(form.value("client_secret"))};
  if (!request.authorization.empty()) {
    if (form.has("client_secret")) refuseRequest("More than one way of client authentication");
    credentials = readBasic(request.authorization);
    if (form.has("client_id") && identifier != credentials.identifier) {
      refuseRequest("client_id is not the one in the Authorization header");
    }
  }
  if (credentials.identifier.text().empty()) refuseClient("Client authentication is required");
  return credentials;
}

void requireSecret(const Credentials& credentials) {
  if (!credentials.secret) refuseClient("Client authentication is required");
}

grants::Application authenticate(const grants::Grants& store, const Credentials& credentials) {
  const auto client = store.applications.authenticate(credentials.identifier, credentials.secret);
  if (!client) throw Refusal{refusalAnswer(client.refusal())};
  return *client;
}

Answer refusalAnswer(const grants::Refusal& refusal) {
  const char* why = grants::explain(refusal.why);
  if (refusal.error == grants::Error::kInvalidClient) return unauthenticated(why);
  return oauthError(400, grants::codeText(refusal.error), why);
}

std::string subjectOf(const grants::Bearer& bearer) {
  return bearer.user ? bearer.user->text() : bearer.application.text();
}

grants::PeerAddress peerAddress(const Request& request) {
  return grants::PeerAddress(request.peer);
}

}  // namespace keldoauth::service
