#include "service/http/answer.h"

#include <json/writer.h>

namespace keldoauth::service {
namespace {

const char* reason(int status) {
  switch (status) {
    case 200:
      return "OK";
    case 201:
      return "Created";
    case 204:
      return "No Content";
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
    case 429:
      return "Too Many Requests";
    case 503:
      return "Service Unavailable";
    default:
      return "Internal Server Error";
  }
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

Json::Value jsonList(std::initializer_list<const char*> texts) {
  Json::Value array(Json::arrayValue);
  for (const char* text : texts) array.append(text);
  return array;
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

std::string textOf(const Answer& answer) {
  std::string text =
      "Status: " + std::to_string(answer.status) + " " + reason(answer.status) + "\r\n";
  for (const auto& [name, value] : answer.headers) {
    text.append(name).append(": ").append(value).append("\r\n");
  }
  return text +
         "Cache-Control: no-store\r\n"
         "X-Content-Type-Options: nosniff\r\n"
         "Referrer-Policy: no-referrer\r\n"
         "\r\n" +
         answer.body;
}

}  // namespace keldoauth::service
