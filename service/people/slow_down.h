// What programs are told who come too often. An application with the right secret
// is always served: it is looked at first, for nobody guesses 256 bits, and wrong
// ones only fill the log.

#ifndef KELDOAUTH_SERVICE_PEOPLE_SLOW_DOWN_H
#define KELDOAUTH_SERVICE_PEOPLE_SLOW_DOWN_H

#include "service/http/answer.h"
#include "service/http/request.h"
#include "service/settings/settings.h"

namespace keldoauth::service {

/// What becomes of an answer where secrets are asked for. A 401 is counted and
/// goes to the system log; when there were too many from that address it becomes
/// a 429 that says when to come back.
Answer afterSecret(const Settings& settings, const Request& request, Answer answer);

/// Counts a registration; throws Refusal with 429 when there were too many from
/// that address.
void countRegistration(const Settings& settings, const Request& request);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_SLOW_DOWN_H
