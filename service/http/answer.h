// What the service answers: status, headers, body; and what it says when it could
// not do what was asked.

#ifndef KELDOAUTH_SERVICE_HTTP_ANSWER_H
#define KELDOAUTH_SERVICE_HTTP_ANSWER_H

#include <json/value.h>

#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

#include "service/http/request.h"

namespace keldoauth::service {

struct Answer {
  int status = 200;
  std::vector<std::pair<std::string, std::string>> headers;
  std::string body;

  /// Adds a header.
  Answer&& with(std::string name, std::string value) &&;
};

/// Thrown to end a request with this answer.
struct Refusal {
  Answer answer;
};

/// Why nobody could have been answered. The request may well be right: nothing
/// is said of it, and nothing has been changed.
struct Failure {
  int status;
  const char* error;  // as RFC 6749, 4.1.2.1 has it
  const char* title;
  const char* text;
};

Answer plainAnswer(int status);
Json::Value jsonList(std::initializer_list<const char*> texts);
Answer jsonAnswer(int status, const Json::Value& document);

/// RFC 6749, 5.2. `description` is a fixed text of ours, never the client's.
Answer oauthError(int status, const std::string& error, const std::string& description);

/// 405; `allowed` as the Allow header lists the methods.
Answer methodNotAllowed(const std::string& allowed);

/// To the user's browser. After a form the next request must be a GET: 303.
Answer redirectAnswer(const Request& request, const std::string& address);

/// As a CGI program writes it, with the headers that every answer has.
std::string textOf(const Answer& answer);

Answer failureAsJson(const Failure& failure);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_ANSWER_H
