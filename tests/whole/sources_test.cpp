// The library's sources by themselves: compiled into this program with nothing
// but the project's root and JsonCpp on the include path, and linked with
// doubles in place of the platform.

#include <gtest/gtest.h>
#include <json/value.h>
#include <unistd.h>

#include <string>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_token.h"
#include "tests/support/doubles.h"
#include "tests/support/private_mounts.h"
#include "tests/support/system_log.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

using namespace KELDOAUTHSERVER;

namespace {

class SourcesTest : public ::testing::Test {
 protected:
  void SetUp() override {
    support::requirePrivateMounts();
    unlink(names::kDatabaseFile);
    support::Platform::useReadableCipher();
    support::Platform::answerRemoteIp("192.0.2.7");
    support::SystemLog::clear();
  }
  void TearDown() override { support::Platform::release(); }
};

TEST_F(SourcesTest, MakeALibraryThatWorks) {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  ASSERT_NE(clients.Add("https://app.example", "read", "App", out), 0);
  const std::string client = out["client_id"].asString();

  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  ASSERT_NE(codes.Add("alice", client, "read", "xyz", getRemoteIP(), out), 0);
  ASSERT_NE(codes.Del(codes.GetIndex(out["code"].asString())), 0);

  OAUTHDBToken tokens(names::kTokenTable);
  ASSERT_NE(tokens.Add("alice", client, "read", "code", "xyz", getRemoteIP(), out), 0);
  Json::Value result;
  EXPECT_TRUE(tokens.Verify(out["access_token"].asString(), result));
  EXPECT_EQ(result["username"].asString(), "alice");
  EXPECT_TRUE(support::SystemLog::lines().empty());
}

TEST_F(SourcesTest, AskThePlatformThroughItsTwoCiphers) {
  OAUTHDBClientInfo clients(names::kClientInfoTable);
  Json::Value out;
  ASSERT_NE(clients.Add("https://app.example", "read", "App", out), 0);
  EXPECT_EQ(
      support::Platform::encrypted(),
      (std::vector<std::string>{out["client_id"].asString(), out["client_secret"].asString()}));
  Json::Value rows;
  ASSERT_NE(clients.Get(&rows), 0);
  EXPECT_EQ(support::Platform::decrypted().size(), 2U);
}

}  // namespace
