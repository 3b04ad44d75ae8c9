// Scripts of other origins (CORS), which may use what needs no cookie and no
// login of the browser's: with "*" it sends neither.

#ifndef KELDOAUTH_SERVICE_PROTOCOL_CORS_H
#define KELDOAUTH_SERVICE_PROTOCOL_CORS_H

#include <string>

#include "service/http/answer.h"

namespace keldoauth::service {

/// To the browser's question beforehand whether a script may send such a
/// request, and to any other OPTIONS. `methods` as the Allow header lists them.
Answer preflightAnswer(const std::string& methods);

/// Lets a script of any origin read the answer.
Answer readableEverywhere(Answer answer);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PROTOCOL_CORS_H
