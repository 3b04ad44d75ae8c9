// Any bytes as a request: the first line is the Content-Length, the second the
// query, the third an Authorization header, the rest the body. Whatever the
// reader lets through keeps to its limits, and what is made of it for pages,
// redirects and rows can be read back or does no harm.

#include <algorithm>
#include <array>
#include <sstream>
#include <string>

#include "service/http/answer.h"
#include "service/http/gateway.h"
#include "service/pages/html.h"
#include "service/protocol/redirect.h"
#include "service/text/encoding.h"
#include "tests/fuzz/expect.h"

namespace {

namespace service = keldoauth::service;
using fuzz::expect;

void expectDecoding(const std::string& text) {
  const std::optional<std::string> decoded = service::formDecode(text);
  if (!decoded) return;
  expect(decoded->find('\0') == std::string::npos, "no NUL byte", text);
  expect(service::formDecode(service::percentEncode(*decoded)) == decoded, "round trip", text);
}

void expectEncodings(const std::string& text) {
  const std::string encoded = service::base64Url(text);
  expect(service::percentEncode(encoded) == encoded, "safe in a form", text);
  service::base64Decode(text);

  const std::string markup = service::escape(text);
  expect(markup.find_first_of("<>\"'") == std::string::npos, "no markup", text);
  const auto isControl = [](char c) {
    return static_cast<unsigned char>(c) < ' ' && c != '\t' && c != '\n' && c != '\r';
  };
  expect(std::none_of(markup.begin(), markup.end(), isControl), "no control character", text);
}

void expectAddress(const std::string& text) {
  constexpr auto kPublic = service::grants::ApplicationKind::kPublic;
  if (!service::isRedirectAddress(text, kPublic)) return;
  expect(text.find_first_of(" \r\n#\\") == std::string::npos, "one line, no fragment", text);
  const bool isPrivate = service::formOf(text) == service::AddressForm::kPrivateUse;
  const std::string rest = isPrivate ? text : text.substr(text.find("://") + 3);
  for (const std::string& entry : {text, rest}) {
    const service::Addresses registered{service::grants::RedirectAddress(entry)};
    expect(service::isRegistered(text, registered, kPublic), "equal to itself", text);
    expect(!service::isRegistered(text + "x", registered, kPublic), "exactly", text);
    const std::string only = service::onlyAddress(registered, kPublic);
    expect(only.empty() || service::isRegistered(only, registered, kPublic), "the default", text);
  }
  expect(text.rfind(service::originOf(text), 0) == 0, "origin", text);
}

void expectParameters(const std::string& query) {
  const std::optional<service::Parameters> parameters = service::Parameters::parse(query);
  if (!parameters) return;
  const std::string name = query.substr(0, query.find('='));
  if (parameters->has(name) && name.find_first_of("&%+") == std::string::npos) {
    expect(parameters->value(name).size() <= query.size(), "no longer than the query", query);
  }
  expect(!parameters->isDoubled(query + "x"), "not there", query);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::istringstream input(std::string(data, data + size));
  std::array<std::string, 3> lines;
  for (std::string& line : lines) std::getline(input, line);
  // The environment of a process ends each value at a NUL byte.
  const auto environment = [&](const char* name) -> const char* {
    const std::string variable = name;
    if (variable == "CONTENT_LENGTH") return lines[0].c_str();
    if (variable == "QUERY_STRING") return lines[1].c_str();
    return variable == "HTTP_AUTHORIZATION" ? lines[2].c_str() : nullptr;
  };
  try {
    const auto body = [&](char* into, std::size_t count) {
      return static_cast<std::size_t>(
          input.read(into, static_cast<std::streamsize>(count)).gcount());
    };
    const service::Request request = service::readRequest(environment, body);
    expect(request.body.size() <= service::kMaxBody, "bounded body");
    expectParameters(request.body);
  } catch (const service::Refusal& refusal) {
    expect(refusal.answer.status >= 400 && refusal.answer.status < 500, "the client's fault");
  }
  service::bearerToken(lines[2]);
  for (const std::string& line : lines) {
    expectDecoding(line);
    expectEncodings(line);
    expectAddress(line);
    expectParameters(line);
  }
  return 0;
}
