#include <json/writer.h>

#include "service/program/service.h"
#include "service/protocol/endpoints.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;

class ManageTest : public ServiceTest {
 protected:
  Json::Value enrol(const std::string& more = "") {
    Request request = withBearer(
        kInitialToken,
        post("/oauth/register",
             R"({"redirect_uris": ["https://app.example/cb"], "client_name": "App")" + more + "}"));
    request.contentType = "application/json";
    const Answer answer = call(registerApplication, request);
    EXPECT_EQ(answer.status, 201) << answer.body;
    return json(answer);
  }
  Json::Value enrolPublic() { return enrol(R"(, "token_endpoint_auth_method": "none")"); }

  Answer send(const std::string& method, const Json::Value& client, const std::string& token,
              const std::string& body = "") {
    Request request = post("/oauth/register/" + client["client_id"].asString(), body);
    request.method = method;
    request.contentType = "application/json";
    if (!token.empty()) request = withBearer(token, request);
    return call(manageRegistration, request);
  }
  Answer send(const std::string& method, const Json::Value& client) {
    return send(method, client, client["registration_access_token"].asString());
  }
  Answer put(const Json::Value& client, const Json::Value& changes) {
    Json::Value body;
    body["client_id"] = client["client_id"];
    body["redirect_uris"] = client["redirect_uris"];
    for (const std::string& name : changes.getMemberNames()) body[name] = changes[name];
    return send("PUT", client, client["registration_access_token"].asString(),
                Json::writeString(Json::StreamWriterBuilder(), body));
  }
  Answer put(const Json::Value& client, const char* name, const Json::Value& value) {
    Json::Value changes;
    changes[name] = value;
    return put(client, changes);
  }
  static grants::ApplicationId idOf(const Json::Value& client) {
    return grants::ApplicationId(client["client_id"].asString());
  }
};

TEST_F(ManageTest, RegistrationSaysWhereAndWithWhat) {
  const Json::Value client = enrol();
  EXPECT_EQ(client["registration_client_uri"],
            "https://box.example/oauth/register/" + client["client_id"].asString());
  EXPECT_EQ(client["registration_access_token"].asString().size(), 43U);
}

TEST_F(ManageTest, APublicApplicationIsToldNoSecret) {
  const Json::Value client = enrolPublic();
  EXPECT_EQ(client["token_endpoint_auth_method"], "none");
  EXPECT_FALSE(client.isMember("client_secret"));
  EXPECT_FALSE(client.isMember("client_secret_expires_at"));
  EXPECT_EQ(client["grant_types"].size(), 2U);
  EXPECT_EQ(store.open().applications.find(idOf(client))->kind, grants::ApplicationKind::kPublic);
}

TEST_F(ManageTest, ReadsWhatIsRegistered) {
  for (const Json::Value& client : {enrol(), enrolPublic()}) {
    const Answer answer = send("GET", client);
    ASSERT_EQ(answer.status, 200);
    Json::Value expected = client;
    expected.removeMember("client_id_issued_at");
    EXPECT_EQ(json(answer), expected);
  }
}

TEST_F(ManageTest, EveryOtherTokenIsRefusedAlike) {
  const Json::Value client = enrol();
  const Json::Value other = enrol();
  const Json::Value open = enrolPublic();
  for (const std::string& token :
       {std::string("x"), std::string(43, 'x'), kInitialToken,
        other["registration_access_token"].asString(), open["registration_access_token"].asString(),
        client["client_secret"].asString(), client["registration_access_token"].asString() + "x"}) {
    for (const char* method : {"GET", "PUT", "DELETE"}) {
      EXPECT_EQ(error(send(method, client, token)), "401 invalid_token") << token;
    }
  }
  EXPECT_EQ(error(send("GET", open, client["registration_access_token"].asString())),
            "401 invalid_token");
  EXPECT_EQ(send("GET", client, "").status, 401);
  EXPECT_EQ(send("GET", client).status, 200);
}

TEST_F(ManageTest, AnApplicationThatIsNotThereIsNoOtherAnswer) {
  Json::Value nobody;
  for (const std::string& id : {std::string(), std::string("x"), std::string(64, 'x'),
                                std::string("' OR 1=1 --"), std::string(5000, 'x')}) {
    nobody["client_id"] = id;
    EXPECT_EQ(error(send("GET", nobody, "x")), "401 invalid_token") << id;
  }
}

TEST_F(ManageTest, OneThatAnAdministratorRegisteredManagesNothing) {
  const grants::Registered own = registered();
  Json::Value client;
  client["client_id"] = own.identifier.text();
  EXPECT_EQ(error(send("GET", client, kInitialToken)), "401 invalid_token");
}

TEST_F(ManageTest, TheTokenEndsWithTheSecret) {
  const Json::Value client = enrol();
  ASSERT_TRUE(store.open().applications.renewSecret(idOf(client), grants::Actor("admin")));
  EXPECT_EQ(error(send("GET", client)), "401 invalid_token");
}

TEST_F(ManageTest, TheTokenEndsWithTheFormKey) {
  const Json::Value client = enrolPublic();
  settings.formKey = std::string(64, 'g');
  EXPECT_EQ(error(send("GET", client)), "401 invalid_token");
}

TEST_F(ManageTest, RemovesTheApplicationAndTheTokenWithIt) {
  for (const Json::Value& client : {enrol(), enrolPublic()}) {
    const Answer answer = send("DELETE", client);
    EXPECT_EQ(answer.status, 204);
    EXPECT_EQ(answer.body, "");
    EXPECT_FALSE(store.open().applications.find(idOf(client)));
    for (const char* method : {"GET", "PUT", "DELETE"}) {
      EXPECT_EQ(error(send(method, client)), "401 invalid_token");
    }
  }
}

TEST_F(ManageTest, ADisabledApplicationIsForbiddenAll) {
  const Json::Value client = enrol();
  store.open().applications.disable(idOf(client), grants::Actor("admin"));
  for (const char* method : {"GET", "PUT", "DELETE"}) {
    EXPECT_EQ(error(send(method, client)), "403 access_denied");
  }
}

TEST_F(ManageTest, ReplacesAllAndKeepsSecretAndToken) {
  const Json::Value client = enrol(R"(, "scope": "profile files.read")");
  Json::Value changes;
  changes["client_name"] = "Renamed";
  changes["redirect_uris"][0] = "https://new.example/cb";
  changes["client_secret"] = client["client_secret"];
  const Answer answer = put(client, changes);
  ASSERT_EQ(answer.status, 200) << answer.body;
  EXPECT_EQ(json(answer)["client_secret"], client["client_secret"]);
  EXPECT_EQ(json(answer)["registration_access_token"], client["registration_access_token"]);
  const auto stored = store.open().applications.find(idOf(client));
  EXPECT_EQ(stored->name.text(), "Renamed");
  EXPECT_EQ(stored->addresses[0].text(), "https://new.example/cb");
  EXPECT_EQ(stored->scope.text(), "profile") << "what is absent gets its default";
  EXPECT_TRUE(stored->registeredItself);
}

TEST_F(ManageTest, NamesItselfAndNothingThatItWasTold) {
  const Json::Value client = enrol();
  EXPECT_EQ(error(put(client, "client_id", std::string(64, 'x'))), "400 invalid_request");
  EXPECT_EQ(error(put(client, "client_id", Json::Value())), "400 invalid_request");
  for (const char* name : {"registration_access_token", "registration_client_uri",
                           "client_secret_expires_at", "client_id_issued_at"}) {
    EXPECT_EQ(error(put(client, name, client[name])), "400 invalid_request") << name;
  }
  EXPECT_EQ(error(put(client, "client_secret", std::string(64, 'x'))), "400 invalid_request");
  EXPECT_EQ(error(put(enrolPublic(), "client_secret", "x")), "400 invalid_request");
}

TEST_F(ManageTest, GetsOrLosesNoSecret) {
  const Json::Value client = enrol();
  EXPECT_EQ(error(put(client, "token_endpoint_auth_method", "none")),
            "400 invalid_client_metadata");
  EXPECT_EQ(put(client, "token_endpoint_auth_method", "client_secret_post").status, 200);
  const Json::Value open = enrolPublic();
  EXPECT_EQ(error(put(open, "token_endpoint_auth_method", "client_secret_basic")),
            "400 invalid_client_metadata");
  EXPECT_EQ(put(open, "client_name", "Still public").status, 200);
}

TEST_F(ManageTest, WhatRegistrationRefusesIsRefusedHereToo) {
  const Json::Value client = enrol();
  Json::Value list;
  list[0] = "javascript:x";
  EXPECT_EQ(error(put(client, "redirect_uris", list)), "400 invalid_redirect_uri");
  list[0] = "com.example.app:/cb";
  EXPECT_EQ(error(put(client, "redirect_uris", list)), "400 invalid_redirect_uri");
  EXPECT_EQ(put(enrolPublic(), "redirect_uris", list).status, 200);
  EXPECT_EQ(error(put(client, "scope", "unknown")), "400 invalid_client_metadata");
  EXPECT_EQ(error(put(client, "client_name", "")), "400 invalid_client_metadata");
  EXPECT_EQ(json(send("GET", client))["client_name"], "App");
}

TEST_F(ManageTest, OtherMethodsAreNotAllowed) {
  const Answer answer = send("POST", enrol());
  EXPECT_EQ(answer.status, 405);
  EXPECT_EQ(header(answer, "Allow"), "DELETE, GET, PUT");
}

TEST_F(ManageTest, NobodyWashesTheLogOut) {
  for (int i = 0; i < 20; ++i) {
    const Json::Value client = enrol();
    EXPECT_EQ(put(client, "client_name", "App " + std::to_string(i)).status, 200);
    EXPECT_EQ(send("DELETE", client).status, 204);
  }
  EXPECT_EQ(store.open().audit.list({}).size(), 3U);
}

TEST_F(ManageTest, AFullRegistryIsFullAndNotBusy) {
  writeSettings(R"({"client_info_max": 1})");
  registered();
  Request request = withBearer(
      kInitialToken, post("/oauth/register", R"({"redirect_uris": ["https://app.example/cb"]})"));
  request.contentType = "application/json";
  const Answer answer = answerBy(*routeOf("/oauth/register", ""), settings, store, request);
  EXPECT_EQ(error(answer), "503 temporarily_unavailable");
  EXPECT_NE(answer.body.find("no room"), std::string::npos);
  EXPECT_EQ(header(answer, "Retry-After"), "");
}

}  // namespace
