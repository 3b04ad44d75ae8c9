#include "service/program/routes.h"

#include <gtest/gtest.h>

#include "service/protocol/endpoints.h"

namespace {

using namespace keldoauth::service;

TEST(RoutesTest, LeadToTheirEndpoint) {
  ASSERT_NE(routeOf("/oauth/token", ""), nullptr);
  EXPECT_EQ(routeOf("/oauth/token", "")->endpoint, token);
  EXPECT_EQ(routeOf("/.well-known/oauth-authorization-server", "")->endpoint, metadata);
}

TEST(RoutesTest, KnowNoOtherPaths) {
  for (const char* path : {"", "/", "/oauth", "/oauth/", "/oauth/token/", "/oauth/token/x",
                           "//oauth/token", "/OAUTH/TOKEN", "oauth/token", "/oauth/tokens"}) {
    EXPECT_EQ(routeOf(path, ""), nullptr) << path;
  }
}

TEST(RoutesTest, LeadFromBelowAnEndpointThatEndsInASlash) {
  EXPECT_EQ(routeOf("/oauth/register", "")->endpoint, registerApplication);
  for (const char* path : {"/oauth/register/x", "/oauth/register/x/y", "/oauth/register//"}) {
    ASSERT_NE(routeOf(path, ""), nullptr) << path;
    EXPECT_EQ(routeOf(path, "")->endpoint, manageRegistration) << path;
  }
  EXPECT_EQ(routeOf("/oauth/register/", ""), nullptr);
}

TEST(RoutesTest, ScriptsOfOtherOriginsComeToNoPage) {
  for (const char* path : {"/oauth/authorize", "/oauth/sign-in", "/oauth/sign-out", "/admin",
                           "/oauth/register", "/oauth/register/x", "/oauth/introspect"}) {
    EXPECT_EQ(routeOf(path, "")->openTo, nullptr) << path;
  }
}

TEST(RoutesTest, StandBelowTheIssuersPath) {
  EXPECT_EQ(routeOf("/auth/oauth/token", "/auth")->endpoint, token);
  for (const char* path : {"/oauth/token", "/auth", "/authoauth/token", "/auth/auth/oauth/token"}) {
    EXPECT_EQ(routeOf(path, "/auth"), nullptr) << path;
  }
}

TEST(RoutesTest, FindWhatIsWellKnownBeforeAndBelowTheIssuersPath) {
  for (const char* path : {"/.well-known/oauth-authorization-server/auth",
                           "/auth/.well-known/oauth-authorization-server"}) {
    ASSERT_NE(routeOf(path, "/auth"), nullptr) << path;
    EXPECT_EQ(routeOf(path, "/auth")->endpoint, metadata);
  }
  EXPECT_EQ(routeOf("/.well-known/oauth-authorization-server", "/auth"), nullptr);
  EXPECT_EQ(routeOf("/oauth/token/auth", "/auth"), nullptr);
}

}  // namespace
