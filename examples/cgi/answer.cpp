#include "examples/cgi/answer.h"

#include <json/writer.h>

#include <cstdlib>
#include <exception>
#include <iostream>
#include <new>

#include "core/oauth_db_basic.h"
#include "core/oauth_errors.h"
#include "utils/oauth_names.h"

namespace service {
namespace {

constexpr char kRetryAfterSeconds[] = "5";

const char* reason(int status) {
  switch (status) {
    case 200:
      return "OK";
    case 201:
      return "Created";
    case 302:
      return "Found";
    case 303:
      return "See Other";
    case 400:
      return "Bad Request";
    case 401:
      return "Unauthorized";
    case 403:
      return "Forbidden";
    case 404:
      return "Not Found";
    case 405:
      return "Method Not Allowed";
    case 413:
      return "Content Too Large";
    case 414:
      return "URI Too Long";
    case 503:
      return "Service Unavailable";
    default:
      return "Internal Server Error";
  }
}

Answer jsonUnavailable() {
  return oauthError(503, "temporarily_unavailable", "The service is busy, please try again");
}

Answer answerTo(Answer (*handle)(const Request&), Answer (*unavailable)()) try {
  return handle(readRequest([](const char* name) { return std::getenv(name); }, std::cin));
} catch (const Refusal& refusal) {
  return refusal.answer;
} catch (const Unavailable&) {
  return unavailable().with("Retry-After", kRetryAfterSeconds);
} catch (const std::bad_alloc&) {
  return unavailable().with("Retry-After", kRetryAfterSeconds);
} catch (const std::exception&) {
  return plainAnswer(500);
}

}  // namespace

Answer&& Answer::with(std::string name, std::string value) && {
  headers.emplace_back(std::move(name), std::move(value));
  return std::move(*this);
}

Answer plainAnswer(int status) {
  return Answer{status,
                {{"Content-Type", "text/plain; charset=utf-8"}},
                std::to_string(status) + " " + reason(status) + "\n"};
}

Answer jsonAnswer(int status, const Json::Value& document) {
  Json::StreamWriterBuilder writer;
  writer["indentation"] = "";
  writer["emitUTF8"] = true;
  return Answer{
      status, {{"Content-Type", "application/json"}}, Json::writeString(writer, document) + "\n"};
}

Answer oauthError(int status, const std::string& error, const std::string& description) {
  Json::Value document;
  document["error"] = error;
  document["error_description"] = description;
  return jsonAnswer(status, document);
}

Answer methodNotAllowed(const std::string& allowed) {
  return plainAnswer(405).with("Allow", allowed);
}

Answer redirectAnswer(const Request& request, const std::string& address) {
  return Answer{request.isRead() ? 302 : 303, {{"Location", address}}, ""};
}

bool hadNoRow(const KELDOAUTHSERVER::OAUTHDBBasic& store) {
  if (store.GetErrCode() != KELDOAUTHSERVER::errors::kNone.code) throw Unavailable{};
  return true;
}

bool takeRow(KELDOAUTHSERVER::OAUTHDBBasic& store, const char* column, const std::string& value) {
  Json::Value request;
  request[KELDOAUTHSERVER::names::kCondition][column] = value;
  return store.DBDel(request) || !hadNoRow(store);
}

void write(const Answer& answer, std::ostream& output) {
  output << "Status: " << answer.status << ' ' << reason(answer.status) << "\r\n";
  for (const auto& [name, value] : answer.headers) output << name << ": " << value << "\r\n";
  output << "Cache-Control: no-store\r\n"
            "X-Content-Type-Options: nosniff\r\n"
            "Referrer-Policy: no-referrer\r\n"
            "\r\n"
         << answer.body << std::flush;
}

int serve(Answer (*handle)(const Request&), Answer (*unavailable)()) {
  write(answerTo(handle, unavailable == nullptr ? jsonUnavailable : unavailable), std::cout);
  return std::cout ? 0 : 1;
}

}  // namespace service
