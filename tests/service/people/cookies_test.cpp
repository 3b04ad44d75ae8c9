#include "service/http/cookies.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>

namespace {

using keldoauth::service::cookieToForget;
using keldoauth::service::cookieToSet;
using keldoauth::service::cookieValue;
using keldoauth::service::Request;

Request requestWith(const std::string& cookies, bool isSecure) {
  Request request;
  request.cookie = cookies;
  request.isSecure = isSecure;
  return request;
}

std::optional<std::string> overTls(const std::string& cookies) {
  return cookieValue(requestWith(cookies, true), "c");
}

TEST(CookiesTest, TheValueIsFoundAmongOthers) {
  for (const char* header :
       {"__Host-c=x", "a=1; __Host-c=x", "__Host-c=x; b=2", "a=1;__Host-c=x;b=2",
        " \t__Host-c = x ;", "c=y; __Host-c=x; __Host-C=z; __Host-cc=1; x__Host-c=2"}) {
    EXPECT_EQ(overTls(header), "x") << header;
  }
}

TEST(CookiesTest, AMissingCookieIsEmpty) {
  for (const char* header : {"", ";", ";;; ", "=x", "c=x", "__Host-c", "d=__Host-c=x", "a"}) {
    EXPECT_EQ(overTls(header), "") << header;
  }
}

TEST(CookiesTest, TwoOfOneNameAreNone) {
  for (const char* header : {"__Host-c=x; __Host-c=y", "__Host-c=x; __Host-c=x",
                             "__Host-c=; __Host-c=x", "__Host-c=x; a=1; __Host-c ="}) {
    EXPECT_EQ(overTls(header), std::nullopt) << header;
  }
}

TEST(CookiesTest, BehindTlsACookieThatASiblingHostCouldSetIsNotOurs) {
  EXPECT_EQ(overTls("c=forged; __Host-c=x; c=forged"), "x");
}

TEST(CookiesTest, OnPlainHttpTheBareNameCounts) {
  EXPECT_EQ(cookieValue(requestWith("__Host-c=y; c=x", false), "c"), "x");
}

TEST(CookiesTest, BehindTlsACookieIsBoundToThisHost) {
  const Request request = requestWith("", true);
  EXPECT_EQ(cookieToSet(request, "c", "x"), "__Host-c=x; Path=/; Secure; HttpOnly; SameSite=Lax");
  EXPECT_EQ(cookieToSet(request, "c", "x", 60),
            "__Host-c=x; Path=/; Secure; HttpOnly; SameSite=Lax; Max-Age=60");
  EXPECT_EQ(cookieToForget(request, "c"),
            "__Host-c=; Path=/; Secure; HttpOnly; SameSite=Lax; Max-Age=0");
}

TEST(CookiesTest, OnPlainHttpItCannotBe) {
  EXPECT_EQ(cookieToSet(requestWith("", false), "c", "x"), "c=x; Path=/; HttpOnly; SameSite=Lax");
}

}  // namespace
