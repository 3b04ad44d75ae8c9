#include <ctime>

#include "service/protocol/authorization_request.h"
#include "service/protocol/endpoints.h"

namespace keldoauth::service {
namespace {

[[noreturn]] void refuse(int status, const std::string& error, const std::string& why) {
  throw Refusal{oauthError(status, error, why)};
}

/// The same faults as at the authorization endpoint, so that none is left for the
/// user to meet.
void requireGood(const Settings& settings, const Parameters& form,
                 const grants::Application& client) {
  if (form.has("request_uri")) {
    refuse(400, "invalid_request", "A request that is pushed brings its parameters");
  }
  AuthorizationRequest asked = startOf(client, form);
  if (!faultOfAddress(asked).empty()) {
    refuse(400, "invalid_request", "redirect_uri is not one that the application registered");
  }
  if (const auto fault = readRest(settings, form, asked)) refuse(400, fault->error, fault->why);
}

}  // namespace

Answer pushRequest(Context& context, const Request& request) {
  const Parameters form = readForm(request, {"redirect_uri"});
  const Credentials credentials = readCredentials(request, form);
  grants::Grants& store = context.store.open();
  const grants::Application client = authenticate(store, credentials);
  requireGood(context.settings, form, client);
  // Not the credentials: what is pushed is stored as it is.
  const grants::RequestText text(form.textWithout({"client_id", "client_secret"}));
  if (text.text().size() > grants::kRequestTextBounds.max) {
    refuse(413, "invalid_request", "The request is too long to be pushed");
  }
  const auto pushed = store.pushed.push({client.identifier, text, peerAddress(request)});
  if (!pushed) return refusalAnswer(pushed.refusal());
  Json::Value document;
  document["request_uri"] = std::string(kReferenceStart) + pushed->reference.text();
  document["expires_in"] = static_cast<Json::Int64>(pushed->expires - std::time(nullptr));
  return jsonAnswer(201, document);
}

}  // namespace keldoauth::service
