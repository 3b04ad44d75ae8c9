#include "examples/cgi/answer.h"

#include <json/writer.h>

#include <cstdlib>
#include <exception>
#include <iostream>
#include <new>

#include "grants/trouble.h"

namespace service {
namespace {

using KELDOAUTHSERVER::grants::Trouble;

constexpr char kRetryAfterSeconds[] = "5";

constexpr Failure kBusy{503, "temporarily_unavailable", "One moment, please",
                        "The box is busy. Nothing was lost; please try again in a few seconds."};
constexpr Failure kFull{503, "temporarily_unavailable", "The box is full",
                        "There is no room for more until its administrator makes some. Nothing "
                        "was lost."};
constexpr Failure kBroken{500, "server_error", "Something is wrong with the box",
                          "Its administrator has to look after it. Nothing was lost."};

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

Answer tryAgain(Answer (*tell)(const Failure&)) {
  return tell(kBusy).with("Retry-After", kRetryAfterSeconds);
}

Answer answerTo(Answer (*handle)(const Request&), Answer (*tell)(const Failure&)) try {
  return handle(readRequest([](const char* name) { return std::getenv(name); }, std::cin));
} catch (const Refusal& refusal) {
  return refusal.answer;
} catch (const Trouble& trouble) {
  if (trouble.canTryAgain()) return tryAgain(tell);
  return tell(trouble.kind() == Trouble::Kind::kFull ? kFull : kBroken);
} catch (const std::bad_alloc&) {
  return tryAgain(tell);
} catch (const std::exception&) {
  return tell(kBroken);
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

Answer failureAsJson(const Failure& failure) {
  return oauthError(failure.status, failure.error, failure.text);
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

int serve(Answer (*handle)(const Request&), Answer (*tell)(const Failure&)) {
  write(answerTo(handle, tell), std::cout);
  return std::cout ? 0 : 1;
}

}  // namespace service
