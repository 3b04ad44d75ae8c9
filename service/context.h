// What an endpoint has besides the request: the settings and the store. It has no
// state of its own and asks no environment.

#ifndef KELDOAUTH_SERVICE_CONTEXT_H
#define KELDOAUTH_SERVICE_CONTEXT_H

#include "service/http/answer.h"
#include "service/http/request.h"
#include "service/settings/settings.h"
#include "service/store/kept_store.h"

namespace keldoauth::service {

struct Context {
  const Settings& settings;
  KeptStore& store;  // open it late: what is refused for its form needs none
};

/// Answers a request. Throws Refusal for what the request did wrong, and lets
/// grants::Trouble pass, which becomes 503 or 500 in one place
/// (program/service.h).
using Endpoint = Answer (*)(Context&, const Request&);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_CONTEXT_H
