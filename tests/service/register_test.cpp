#include "service/protocol/endpoints.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;

constexpr char kPlain[] = R"({"redirect_uris": ["https://app.example/callback"]})";

class RegisterTest : public ServiceTest {
 protected:
  Answer send(const std::string& metadata, const std::string& initialToken = kInitialToken) {
    Request request = withBearer(initialToken, post("/oauth/register", metadata));
    request.contentType = "application/json";
    return call(registerApplication, request);
  }
};

TEST_F(RegisterTest, TakesAnApplicationThatSaysNoMoreThanItsAddress) {
  const Answer answer = send(kPlain);
  ASSERT_EQ(answer.status, 201);
  const Json::Value document = json(answer);
  EXPECT_EQ(document["client_id"].asString().size(), 64U);
  EXPECT_EQ(document["client_secret"].asString().size(), 64U);
  EXPECT_EQ(document["redirect_uris"][0], "https://app.example/callback");
  EXPECT_EQ(document["scope"], "profile");
}

TEST_F(RegisterTest, GivesOfTheScopesThoseThatTheSettingsKnow) {
  const Answer answer = send(R"({"redirect_uris": ["https://app.example/callback"],
                                 "scope": "music files.read profile"})");
  EXPECT_EQ(json(answer)["scope"], "files.read profile");
}

TEST_F(RegisterTest, IsClosedWithoutTheInitialToken) {
  const Answer wrong = send(kPlain, "wrong");
  EXPECT_EQ(error(wrong), "401 invalid_token");
  Request none = post("/oauth/register", kPlain);
  none.contentType = "application/json";
  EXPECT_EQ(call(registerApplication, none).status, 401);
  EXPECT_NE(access(kDatabase, F_OK), 0);
}

TEST_F(RegisterTest, IsClosedToAllWhenTheSettingsHaveNoToken) {
  settings.initialAccessToken.clear();
  EXPECT_EQ(error(send(kPlain, "")), "401 invalid_token");
}

TEST_F(RegisterTest, RefusesWhatIsNoJsonObject) {
  for (const char* body : {"", "{", "[]", "null", "{} {}", "{\"a\": 1, }"}) {
    EXPECT_EQ(error(send(body)), "400 invalid_client_metadata") << body;
  }
  EXPECT_EQ(error(send(std::string(5000, '['))), "400 invalid_client_metadata");
}

TEST_F(RegisterTest, RefusesMetadataOfOtherKinds) {
  for (const char* member :
       {R"("client_name": 1)", R"("client_name": "")", R"("client_name": "a\u0000b")",
        R"("scope": ["profile"])", R"("scope": "music")", R"("grant_types": "x")",
        R"("grant_types": ["implicit"])", R"("response_types": ["token"])"}) {
    const std::string body =
        std::string(R"({"redirect_uris": ["https://app.example/callback"], )") + member + "}";
    EXPECT_EQ(error(send(body)), "400 invalid_client_metadata") << member;
  }
}

TEST_F(RegisterTest, RefusesAddressesThatAreNone) {
  for (const char* address : {R"("")", "1", R"("javascript:x")", R"("http://app.example/")",
                              R"("https://app.example/#f")", R"("https://u@app.example/")"}) {
    const std::string body = std::string(R"({"redirect_uris": [)") + address + "]}";
    EXPECT_EQ(error(send(body)), "400 invalid_redirect_uri") << address;
  }
  EXPECT_EQ(error(send("{}")), "400 invalid_redirect_uri");
}

TEST_F(RegisterTest, LeavesAnEntryThatItRegisteredItself) {
  ASSERT_EQ(send(kPlain).status, 201);
  EXPECT_EQ(store.open().audit.list({}).size(), 1U);
  EXPECT_TRUE(store.open().applications.all()[0].registeredItself);
}

}  // namespace
