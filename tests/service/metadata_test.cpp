#include <algorithm>

#include "service/protocol/endpoints.h"
#include "tests/service/service_test.h"

namespace {

using namespace service_test;

class MetadataTest : public ServiceTest {};

TEST_F(MetadataTest, NamesTheIssuerAndEndpointsBelowIt) {
  settings.issuer = "https://box.example/auth";
  settings.basePath = "/auth";
  const Json::Value document = json(call(metadata, get("/")));
  EXPECT_EQ(document["issuer"], "https://box.example/auth");
  EXPECT_EQ(document["token_endpoint"], "https://box.example/auth/oauth/token");
  for (const std::string& name : document.getMemberNames()) {
    if (name.find("_endpoint") + 9 != name.size()) continue;
    EXPECT_EQ(document[name].asString().rfind("https://box.example/auth/", 0), 0U) << name;
  }
}

TEST_F(MetadataTest, ListsTheScopesOfTheSettings) {
  const Json::Value scopes = json(call(metadata, get("/")))["scopes_supported"];
  const auto has = [&](const char* name) {
    return std::find(scopes.begin(), scopes.end(), Json::Value(name)) != scopes.end();
  };
  EXPECT_TRUE(has("files.read"));
  EXPECT_TRUE(has("profile"));
  EXPECT_FALSE(has("photos.read"));
}

TEST_F(MetadataTest, IsOnlyRead) {
  const Answer answer = call(metadata, post("/", ""));
  EXPECT_EQ(answer.status, 405);
  EXPECT_NE(header(answer, "Allow"), "");
}

TEST_F(MetadataTest, NeedsNoStore) {
  call(metadata, get("/"));
  EXPECT_NE(access(kDatabase, F_OK), 0);
}

}  // namespace
