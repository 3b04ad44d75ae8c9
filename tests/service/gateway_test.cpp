#include "service/http/gateway.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <new>
#include <stdexcept>

using ::testing::HasSubstr;
using ::testing::StartsWith;

namespace {

using namespace keldoauth::service;
using Variables = std::map<std::string, std::string>;

Environment environmentOf(const Variables& variables) {
  return [&variables](const char* name) {
    const auto found = variables.find(name);
    return found == variables.end() ? nullptr : found->second.c_str();
  };
}

/// A body that can be read in one go.
ReadBody bodyOf(const std::string& text) {
  return [rest = text](char* into, std::size_t count) mutable {
    const std::size_t got = std::min(count, rest.size());
    std::memcpy(into, rest.data(), got);
    rest.erase(0, got);
    return got;
  };
}

Request read(const Variables& variables, const std::string& body = "") {
  return readRequest(environmentOf(variables), bodyOf(body));
}

/// The status of the refusal; 0 without one.
int refusalOf(const Variables& variables, const std::string& body = "") {
  try {
    read(variables, body);
  } catch (const Refusal& refusal) {
    return refusal.answer.status;
  }
  return 0;
}

TEST(GatewayTest, ReadsARequest) {
  const Request request = read({{"REQUEST_METHOD", "POST"},
                                {"SCRIPT_NAME", "/oauth"},
                                {"PATH_INFO", "/token"},
                                {"QUERY_STRING", "a=b"},
                                {"CONTENT_TYPE", "Application/X-WWW-Form-Urlencoded ; charset=x"},
                                {"CONTENT_LENGTH", "3"},
                                {"HTTP_AUTHORIZATION", "Bearer x"},
                                {"HTTP_COOKIE", "c=d"},
                                {"HTTP_ORIGIN", "https://app.example"},
                                {"HTTP_ACCEPT", "text/html"},
                                {"REMOTE_USER", "alice"},
                                {"REMOTE_ADDR", "192.0.2.1"},
                                {"HTTPS", "on"}},
                               "e=fghi");
  EXPECT_EQ(request.method, "POST");
  EXPECT_EQ(request.path, "/oauth/token");
  EXPECT_EQ(request.query, "a=b");
  EXPECT_TRUE(request.isForm());
  EXPECT_EQ(request.body, "e=f");
  EXPECT_EQ(request.authorization, "Bearer x");
  EXPECT_EQ(request.cookie, "c=d");
  EXPECT_EQ(request.origin, "https://app.example");
  EXPECT_EQ(request.accept, "text/html");
  EXPECT_EQ(request.user, "alice");
  EXPECT_EQ(request.peer, "192.0.2.1");
  EXPECT_TRUE(request.isSecure);
}

TEST(GatewayTest, ReadsAnEmptyEnvironment) {
  const Request request = read({});
  EXPECT_EQ(request.method + request.path + request.query + request.body + request.user, "");
  EXPECT_FALSE(request.isSecure);
  EXPECT_FALSE(request.isRead());
}

TEST(GatewayTest, TakesOnlyIpAddressesForAPeer) {
  for (const char* address : {"127.0.0.1", "::1", "2001:db8::1", "::ffff:192.0.2.1"}) {
    EXPECT_EQ(read({{"REMOTE_ADDR", address}}).peer, address);
  }
  for (const char* address : {"unix:", "127.0.0.1:80", "[::1]", "localhost", "1.2.3", "' OR 1"}) {
    EXPECT_EQ(read({{"REMOTE_ADDR", address}}).peer, "") << address;
  }
}

TEST(GatewayTest, TakesNothingButOnForTls) {
  EXPECT_TRUE(read({{"HTTPS", "ON"}}).isSecure);
  for (const char* value : {"", "off", "1", "on,on"}) {
    EXPECT_FALSE(read({{"HTTPS", value}}).isSecure) << value;
  }
}

TEST(GatewayTest, RefusesALongQuery) {
  EXPECT_EQ(refusalOf({{"QUERY_STRING", std::string(kMaxQuery, 'q')}}), 0);
  EXPECT_EQ(refusalOf({{"QUERY_STRING", std::string(kMaxQuery + 1, 'q')}}), 414);
}

TEST(GatewayTest, RefusesALongBodyWithoutReadingIt) {
  const std::string most(kMaxBody, 'b');
  EXPECT_EQ(read({{"CONTENT_LENGTH", std::to_string(kMaxBody)}}, most).body, most);
  bool isRead = false;
  const Variables variables{{"CONTENT_LENGTH", std::to_string(kMaxBody + 1)}};
  const auto body = [&](char*, std::size_t) {
    isRead = true;
    return std::size_t{0};
  };
  EXPECT_THROW(readRequest(environmentOf(variables), body), Refusal);
  EXPECT_FALSE(isRead);
}

TEST(GatewayTest, RefusesLengthsThatAreNone) {
  for (const char* length : {"x", "-1", "+1", "1x", " 1", "0x1", "1.0"}) {
    EXPECT_EQ(refusalOf({{"CONTENT_LENGTH", length}}, "body"), 400) << length;
  }
  EXPECT_EQ(refusalOf({{"CONTENT_LENGTH", "99999999999999999999999"}}), 413);
}

TEST(GatewayTest, RefusesABodyThatEndsEarly) {
  EXPECT_EQ(refusalOf({{"CONTENT_LENGTH", "5"}}, "four"), 400);
}

TEST(GatewayTest, WritesStatusHeadersAndBody) {
  const std::string text = respond(environmentOf({}), bodyOf(""), [](const Request&) {
    return Answer{201, {{"X-Name", "value"}}, "body"};
  });
  EXPECT_THAT(text, StartsWith("Status: 201 Created\r\nX-Name: value\r\n"));
  EXPECT_THAT(text, HasSubstr("\r\nCache-Control: no-store\r\n"));
  EXPECT_THAT(text, ::testing::EndsWith("\r\n\r\nbody"));
}

TEST(GatewayTest, AnswersRefusalsOfItsOwn) {
  const Variables variables{{"CONTENT_LENGTH", "x"}};
  const std::string text =
      respond(environmentOf(variables), bodyOf(""), [](const Request&) { return Answer{}; });
  EXPECT_THAT(text, StartsWith("Status: 400 Bad Request\r\n"));
}

TEST(GatewayTest, AnswersWhenMemoryRunsOut) {
  const std::string text = respond(environmentOf({}), bodyOf(""),
                                   [](const Request&) -> Answer { throw std::bad_alloc(); });
  EXPECT_THAT(text, StartsWith("Status: 500 "));
}

}  // namespace
