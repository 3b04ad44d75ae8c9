#include "service/program/service.h"

#include <exception>
#include <iostream>
#include <new>
#include <utility>

#include "grants/trouble.h"

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

Answer tellBusy(const Route& route, const Settings& settings) {
  return route.tell(settings, kBusy).with("Retry-After", kRetryAfterSeconds);
}

Answer tellTrouble(const Route& route, const Settings& settings, const Trouble& trouble) {
  if (trouble.canTryAgain()) return tellBusy(route, settings);
  return route.tell(settings, trouble.kind() == Trouble::Kind::kFull ? kFull : kBroken);
}

}  // namespace

Service::Service(std::string settingsPath) : settingsPath_(std::move(settingsPath)) {}

Answer Service::answer(const Request& request) {
  try {
    if (!settings_) settings_ = readSettings(settingsPath_);
  } catch (const std::exception& error) {
    std::cerr << "keldoauth-service: " << error.what() << '\n';
    const Route* const route = routeOf(request.path, "");
    return route == nullptr ? failureAsJson(kBroken) : route->tell({}, kBroken);
  }
  const Route* const route = routeOf(request.path, settings_->basePath);
  if (route == nullptr) return plainAnswer(404);
  Answer answer = answerBy(*route, request);
  store_.drop();
  return answer;
}

Answer Service::answerBy(const Route& route, const Request& request) try {
  Context context{*settings_, store_};
  return route.endpoint(context, request);
} catch (const Refusal& refusal) {
  return refusal.answer;
} catch (const Trouble& trouble) {
  return tellTrouble(route, *settings_, trouble);
} catch (const std::bad_alloc&) {
  return tellBusy(route, *settings_);
} catch (const std::exception&) {
  return route.tell(*settings_, kBroken);
}

}  // namespace keldoauth::service
