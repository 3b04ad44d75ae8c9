#include "service/program/service.h"

#include <exception>
#include <iostream>
#include <new>
#include <utility>

#include "grants/trouble.h"
#include "service/http/web_address.h"
#include "service/pages/html.h"
#include "service/people/people.h"
#include "service/people/slow_down.h"
#include "service/protocol/cors.h"
#include "service/signing/key_fault.h"

namespace keldoauth::service {
namespace {

using grants::Trouble;

constexpr char kRetryAfterSeconds[] = "5";

constexpr Failure kBusy{503, "temporarily_unavailable", "One moment, please",
                        "The box is busy. Nothing was lost; please try again in a few seconds."};
constexpr Failure kFull{503, "temporarily_unavailable", "The box is full",
                        "There is no room for more until its administrator makes some. Nothing "
                        "was lost."};
constexpr Failure kBroken{500, "server_error", "Something is wrong with the box",
                          "Its administrator has to look after it. Nothing was lost."};

constexpr Failure kInTheClear{403, "invalid_request", "Not without TLS",
                              "What is sent to this service must not be readable on the way: it "
                              "answers at its https address alone."};

/// To people as a page, to programs in as few words as can be.
Answer tellNoSuchPage(const Settings& settings, const Request& request) {
  if (request.accept.find("text/html") == std::string::npos) return plainAnswer(404);
  return messagePage(settings, 404, "There is no such page",
                     "The address is not one of this service.", "/account");
}

Answer tellBusy(const Route& route, const Settings& settings) {
  return route.tell(settings, kBusy).with("Retry-After", kRetryAfterSeconds);
}

Answer tellTrouble(const Route& route, const Settings& settings, const Trouble& trouble) {
  if (trouble.canTryAgain()) return tellBusy(route, settings);
  return route.tell(settings, trouble.kind() == Trouble::Kind::kFull ? kFull : kBroken);
}

Answer attempt(const Route& route, const Settings& settings, KeptStore& store,
               const Request& request) try {
  store.startRequest();
  Context context{settings, store};
  return route.endpoint(context, request);
} catch (const Refusal& refusal) {
  return refusal.answer;
}

}  // namespace

Service::Service(std::string settingsPath) : settings_(std::move(settingsPath)) {}

Answer Service::answer(const Request& request) try {
  const Settings& settings = settings_.current();
  const Route* const route = routeOf(request.path, settings.basePath);
  if (route == nullptr) return tellNoSuchPage(settings, request);
  if (!request.isSecure && !isLoopbackPeer(request.peer)) return route->tell(settings, kInTheClear);
  if (route->openTo != nullptr && request.method == "OPTIONS") {
    return preflightAnswer(route->openTo);
  }
  Answer answer = answerBy(*route, settings, store_, request);
  if (route->asksSecret) answer = afterSecret(settings, request, std::move(answer));
  return route->openTo == nullptr ? answer : readableEverywhere(std::move(answer));
} catch (const SettingsFault& fault) {
  for (const std::string& line : fault.faults()) std::cerr << "keldoauth-service: " << line << '\n';
  const Route* const route = routeOf(request.path, "");
  return route == nullptr ? failureAsJson(kBroken) : route->tell({}, kBroken);
}

Answer answerBy(const Route& route, const Settings& settings, KeptStore& store,
                const Request& request) try {
  Request known = request;
  recognise(settings, known);
  try {
    Answer answer = attempt(route, settings, store, known);
    if (!store.wasReplaced()) return answer;
  } catch (const Trouble&) {
    if (!store.wasReplaced()) throw;
  }
  store.drop();
  return attempt(route, settings, store, known);
} catch (const Trouble& trouble) {
  store.drop();
  return tellTrouble(route, settings, trouble);
} catch (const signing::KeyFault& fault) {
  std::cerr << "keldoauth-service: " << fault.what() << '\n';
  return route.tell(settings, kBroken);
} catch (const DirectoryTrouble& trouble) {
  std::cerr << "keldoauth-service: " << trouble.what() << '\n';
  return tellBusy(route, settings);
} catch (const std::bad_alloc&) {
  store.drop();
  return tellBusy(route, settings);
} catch (const std::exception&) {
  store.drop();
  return route.tell(settings, kBroken);
}

}  // namespace keldoauth::service
