// The command line and the library while the key of the store is away.

#include <sys/stat.h>

#include <filesystem>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_token.h"
#include "tests/operations/operations_test.h"
#include "utils/oauth_names.h"

namespace operations {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;
using testing::HasSubstr;
using testing::Not;

const Arguments kAddClient{"client",  "add",  "--redirect-uri", "app:/",
                           "--scope", "read", "--name",         "late"};

class KeyAway : public Operations {
 protected:
  void SetUp() override {
    Operations::SetUp();
    furnish();
    content_ = contentOf();
    cipher_ = sqlText("SELECT client_id FROM oauth_clientInfo WHERE id=1");
    fs::rename(kKey, kAway);
  }

  void expectNothingDone() const {
    EXPECT_EQ(contentOf(), content_);
    EXPECT_FALSE(fs::exists(kKey));
  }

  static constexpr char kAway[] = "/var/packages/Corvane/target/etc/away.key";
  static constexpr char kMark[] = "(cannot be decrypted)";

  Content content_;
  std::string cipher_;
};

TEST_F(KeyAway, ClientIsRefusedAndTheKeyIsNamed) {
  const Outcome outcome = run(kAddClient);
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_EQ(outcome.err,
            std::string("keldoauth: client add: Data Decrypt failed (-4)\nhint: the key file ") +
                kKey + " is missing\n");
  expectNothingDone();
}

TEST_F(KeyAway, ClientIsRefusedWithAnotherKeyInItsPlace) {
  writeFile(kKey, std::string(64, 'k'));
  ::chmod(kKey, 0600);
  const Outcome outcome = run(kAddClient);
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_EQ(outcome.err,
            "keldoauth: client add: the platform's key is not the one that encrypted this store\n"
            "hint: nothing was stored; put back the key that belongs to the store\n");
  EXPECT_EQ(contentOf(), content_);
}

TEST_F(KeyAway, ClientIsRefusedByTheLibraryToo) {
  {
    KELDOAUTHSERVER::OAUTHDBClientInfo clients(names::kClientInfoTable);
    Json::Value out;
    EXPECT_FALSE(clients.Add("app:/", "read", "late", out));
    EXPECT_EQ(clients.GetErrCode(), -4);
    EXPECT_EQ(clients.GetErrMsg(), "Data Encrypt failed");
  }
  expectNothingDone();
}

TEST_F(KeyAway, TokenIsRefusedByTheLibraryToo) {
  {
    KELDOAUTHSERVER::OAUTHDBToken tokens(names::kTokenTable);
    Json::Value out;
    EXPECT_FALSE(
        tokens.Add("user", std::string(64, 'c'), "read", "implicit", "s", "192.0.2.1", out));
    EXPECT_EQ(tokens.GetErrCode(), -4);
  }
  expectNothingDone();
}

TEST_F(KeyAway, ClientIsFoundAgainOnceTheKeyIsBack) {
  run(kAddClient);
  fs::rename(kAway, kKey);
  EXPECT_THAT(run(kAddClient), ExitsWith(cli::kOk));
  EXPECT_THAT(run({"client", "list"}).out, Not(HasSubstr(kMark)));
}

TEST_F(KeyAway, LookingAndTidyingUpMakeNoKey) {
  for (const Arguments& command : std::vector<Arguments>{{"status"},
                                                         {"client", "list"},
                                                         {"client", "show", "1"},
                                                         {"code", "list"},
                                                         {"token", "list"},
                                                         {"log", "list"},
                                                         {"code", "purge", "--yes"},
                                                         {"token", "purge", "--yes"},
                                                         {"backup", kCopy},
                                                         {"restore", "--yes", kCopy},
                                                         {"rekey", "--yes"}}) {
    run(command);
    EXPECT_FALSE(fs::exists(kKey)) << command.back();
  }
  EXPECT_EQ(contentOf(), content_);
}

TEST_F(KeyAway, WhatCannotBeDecryptedIsMarkedWhereverItIsShown) {
  for (const Arguments& command : std::vector<Arguments>{{"client", "list", "--reveal"},
                                                         {"client", "show", "1", "--reveal"},
                                                         {"client", "show", "1"},
                                                         {"code", "list"},
                                                         {"code", "show", "1"},
                                                         {"token", "list"},
                                                         {"token", "show", "1"}}) {
    const Outcome outcome = run(command);
    EXPECT_THAT(outcome, ExitsWith(cli::kOk));
    EXPECT_THAT(outcome.out, Not(HasSubstr(cipher_.substr(0, 6))));
    if (command[0] == "client" || command[1] == "show") {
      EXPECT_THAT(outcome.out, HasSubstr(kMark));
    }
    Arguments asJson = command;
    asJson.emplace_back("--json");
    const std::string document = run(asJson).out;
    EXPECT_THAT(document, Not(HasSubstr(cipher_.substr(0, 6))));
    EXPECT_THAT(document, HasSubstr("\"client_id\":null"));
    EXPECT_THAT(document, HasSubstr("\"undecrypted\":[\"client_id\""));
  }
}

TEST_F(KeyAway, PurgedRowsAreMarkedToo) {
  expireIn("oauth_token", 1, -31LL * 24 * 60 * 60);
  const Outcome outcome = run({"token", "purge", "--yes", "--json"});
  EXPECT_THAT(outcome, ExitsWith(cli::kOk));
  EXPECT_THAT(outcome.out, HasSubstr("\"undecrypted\":[\"client_id\"]"));
  EXPECT_THAT(outcome.out, Not(HasSubstr(cipher_.substr(0, 6))));
  EXPECT_EQ(rowCount("oauth_token"), "2");
}

TEST_F(KeyAway, AClientThatCannotBeDecryptedIsNotChanged) {
  for (const char* verb : {"enable", "disable", "renew-secret", "revoke", "remove"}) {
    Arguments command{"client", verb, "1"};
    if (std::string(verb).find("able") == std::string::npos) command.emplace_back("--yes");
    const Outcome outcome = run(command);
    EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
    EXPECT_THAT(outcome.err, HasSubstr("client 1: its identifier cannot be decrypted\n"));
  }
  expectNothingDone();
}

TEST_F(KeyAway, NothingIsIssuedToAClientThatCannotBeDecrypted) {
  const Outcome outcome =
      run({"token", "issue", "--client", "1", "--username", "u", "--scope", "s"});
  EXPECT_THAT(outcome, ExitsWith(cli::kUnavailable));
  EXPECT_THAT(outcome.err,
              HasSubstr("client 1: its identifier cannot be decrypted\nhint: the key file "));
  expectNothingDone();
}

TEST_F(KeyAway, StoreWithoutAnyValueGetsAnotherKey) {
  execute(kDatabase,
          "DELETE FROM oauth_clientInfo; DELETE FROM oauth_grantCode; DELETE FROM oauth_token");
  EXPECT_THAT(run(kAddClient), ExitsWith(cli::kOk));
  EXPECT_EQ(readFile(kKey).size(), 64U);
}

TEST_F(KeyAway, FreshInstallationNeedsNoStep) {
  putBack(kStateDir, {});
  EXPECT_THAT(run(kAddClient), ExitsWith(cli::kOk));
  EXPECT_EQ(readFile(kKey).size(), 64U);
  EXPECT_THAT(run({"status"}), ExitsWith(cli::kOk));
}

}  // namespace
}  // namespace operations
