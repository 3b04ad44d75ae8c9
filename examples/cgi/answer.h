// What a program answers: status, headers, body; and the two ways out of the
// middle of a request.

#ifndef KELDOAUTH_EXAMPLES_CGI_ANSWER_H
#define KELDOAUTH_EXAMPLES_CGI_ANSWER_H

#include <json/value.h>

#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "examples/cgi/http.h"

namespace KELDOAUTHSERVER {
class OAUTHDBBasic;
}

namespace service {

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

/// Thrown when the store could not say: the client may well be right and shall
/// try again. Becomes 503 with Retry-After, in the form that the program speaks.
struct Unavailable {};

Answer plainAnswer(int status);
Answer jsonAnswer(int status, const Json::Value& document);

/// RFC 6749, 5.2. `description` is a fixed text of ours, never the client's.
Answer oauthError(int status, const std::string& error, const std::string& description);

/// 405; `allowed` as the Allow header lists the methods.
Answer methodNotAllowed(const std::string& allowed);

/// To the user's browser. After a form the next request must be a GET: 303.
Answer redirectAnswer(const Request& request, const std::string& address);

/// True when `store` never failed: then an operation without effect had no row
/// to work on. Otherwise throws Unavailable.
bool hadNoRow(const KELDOAUTHSERVER::OAUTHDBBasic& store);

/// Deletes what has this value in `column`. True when there was a row: with a
/// unique column, for the one caller who deleted it. Never delete by `id`
/// what was read a moment ago: SQLite gives the id of the last row, once it is
/// deleted, to the next one, and of two requests with one code the slower would
/// delete somebody else's.
bool takeRow(KELDOAUTHSERVER::OAUTHDBBasic& store, const char* column, const std::string& value);

void write(const Answer& answer, std::ostream& output);

/// The whole life of a program: reads the request, answers with what `handle`
/// returns or throws, and with `unavailable` when the store could not say.
int serve(Answer (*handle)(const Request&), Answer (*unavailable)() = nullptr);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_ANSWER_H
