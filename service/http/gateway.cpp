#include "service/http/gateway.h"

#include <arpa/inet.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <exception>
#include <system_error>

#include "service/text/encoding.h"

namespace keldoauth::service {
namespace {

constexpr char kNoMemory[] =
    "Status: 500 Internal Server Error\r\nContent-Type: text/plain\r\n\r\nout of memory\n";

std::string variable(const Environment& environment, const char* name) {
  const char* value = environment(name);
  return value == nullptr ? std::string() : std::string(value);
}

std::string mediaType(const std::string& header) {
  std::string type = header.substr(0, header.find(';'));
  while (!type.empty() && (type.back() == ' ' || type.back() == '\t')) type.pop_back();
  std::transform(type.begin(), type.end(), type.begin(), lowerCase);
  return type;
}

std::size_t contentLength(const std::string& text) {
  if (text.empty()) return 0;
  std::size_t length = 0;
  const char* end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, length);
  if (error == std::errc::result_out_of_range) throw Refusal{plainAnswer(413)};
  if (error != std::errc() || stop != end) throw Refusal{plainAnswer(400)};
  return length;
}

std::string readBody(std::size_t length, const ReadBody& read) {
  if (length > kMaxBody) throw Refusal{plainAnswer(413)};
  std::string body(length, '\0');
  if (length != 0 && read(body.data(), length) != length) throw Refusal{plainAnswer(400)};
  return body;
}

/// What is no address of a peer is none.
std::string addressOf(const std::string& text) {
  std::array<unsigned char, sizeof(in6_addr)> bytes{};
  const bool isOne = inet_pton(AF_INET, text.c_str(), bytes.data()) == 1 ||
                     inet_pton(AF_INET6, text.c_str(), bytes.data()) == 1;
  return isOne ? text : std::string();
}

Answer answerTo(const Environment& environment, const ReadBody& body,
                const Answering& answering) try {
  return answering(readRequest(environment, body));
} catch (const Refusal& refusal) {
  return refusal.answer;
}

}  // namespace

Request readRequest(const Environment& environment, const ReadBody& body) {
  Request request;
  request.method = variable(environment, "REQUEST_METHOD");
  request.path = variable(environment, "SCRIPT_NAME") + variable(environment, "PATH_INFO");
  request.query = variable(environment, "QUERY_STRING");
  request.contentType = mediaType(variable(environment, "CONTENT_TYPE"));
  request.authorization = variable(environment, "HTTP_AUTHORIZATION");
  request.cookie = variable(environment, "HTTP_COOKIE");
  request.origin = variable(environment, "HTTP_ORIGIN");
  request.accept = variable(environment, "HTTP_ACCEPT");
  request.user = variable(environment, "REMOTE_USER");
  request.peer = addressOf(variable(environment, "REMOTE_ADDR"));
  request.isSecure = equalWords(variable(environment, "HTTPS"), "on");
  if (request.query.size() > kMaxQuery) throw Refusal{plainAnswer(414)};
  request.body = readBody(contentLength(variable(environment, "CONTENT_LENGTH")), body);
  return request;
}

std::string respond(const Environment& environment, const ReadBody& body,
                    const Answering& answering) try {
  return textOf(answerTo(environment, body, answering));
} catch (const std::exception&) {
  return kNoMemory;
}

}  // namespace keldoauth::service
