// keldoauth client.

#include "tests/tools/cli.h"

namespace cli {
namespace {

using testing::EndsWith;
using testing::HasSubstr;
using testing::MatchesRegex;
using testing::Not;
using testing::StartsWith;

class ClientCommand : public CliTest {
 protected:
  static Arguments addArguments(const std::string& redirect, const std::string& scope,
                                const std::string& name) {
    return {"client", "add", "--redirect-uri", redirect, "--scope", scope, "--name", name};
  }

  static Json::Value shown(const Json::Value& client) {
    return json({"client", "show", client["id"].asString()})["client"];
  }
};

// add ---------------------------------------------------------------------------

TEST_F(ClientCommand, AddShowsGeneratedIdentifierAndSecretInFull) {
  const Json::Value client = addClient();
  EXPECT_THAT(client["client_id"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_THAT(client["client_secret"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(client["client_id"], client["client_secret"]);
}

TEST_F(ClientCommand, AddAnswersWithTheStoredRow) {
  const Json::Value client = addClient();
  EXPECT_EQ(client["id"], Json::Value(1));
  EXPECT_EQ(client["enabled"], Json::Value(true));
  EXPECT_EQ(client["redirect_uri"], "https://frame.example.org/back");
  EXPECT_EQ(client["redirect_uris"].size(), 1U);
  EXPECT_EQ(client["public"], Json::Value(false));
  EXPECT_EQ(client["pkce_required"], Json::Value(true));
  EXPECT_EQ(client["scope"], "profile photos");
  EXPECT_EQ(client["display_name"], "Photo Frame");
}

TEST_F(ClientCommand, AddTellsPeopleIdentifierAndSecret) {
  const Outcome added = run(addArguments("app:/back", "x", "Player"));
  EXPECT_THAT(added, ExitsWith(kOk));
  const std::vector<std::string> said = lines(added.out);
  ASSERT_EQ(said.size(), 3U);
  EXPECT_EQ(said[0], "Registered client 1 (Player).");
  EXPECT_THAT(said[1], MatchesRegex("client id      [0-9a-f]{64}"));
  EXPECT_THAT(said[2], MatchesRegex("client secret  [0-9a-f]{64}"));
}

TEST_F(ClientCommand, AddWritesTheAuditLog) {
  const std::string start = addClient()["client_id"].asString().substr(0, 8);
  EXPECT_EQ(sqlText("SELECT msg FROM oauth_log"),
            "Application registered[Photo Frame " + start + "] by [carol]");
}

TEST_F(ClientCommand, AddTakesAnIdentifier) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--client-id", support::id64('c')});
  EXPECT_EQ(json(arguments)["client"]["client_id"], support::id64('c'));
}

TEST_F(ClientCommand, AddRefusesAnIdentifierThatExists) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--client-id", support::id64('c')});
  ASSERT_THAT(run(arguments), ExitsWith(kOk));
  const Outcome again = run(arguments);
  EXPECT_THAT(again, ExitsWith(kRefused));
  EXPECT_EQ(again.err, "keldoauth: client add: the identifier is taken (-2)\n");
  EXPECT_EQ(rowCount("oauth_clientInfo"), "1");
}

TEST_F(ClientCommand, AddDisabled) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.emplace_back("--disabled");
  EXPECT_EQ(json(arguments)["client"]["enabled"], Json::Value(false));
}

TEST_F(ClientCommand, AddTakesTheSecretFromStandardInput) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--secret-file", "-"});
  ASSERT_THAT(run(arguments, support::id64('s') + "\n"), ExitsWith(kOk));
  EXPECT_EQ(json({"client", "show", "1", "--reveal"})["client"]["client_secret"],
            support::id64('s'));
}

TEST_F(ClientCommand, AddTakesTheSecretFromAFile) {
  writeFile("/tmp/secret", support::id64('s') + "\r\n");
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--secret-file", "/tmp/secret"});
  ASSERT_THAT(run(arguments), ExitsWith(kOk));
  EXPECT_EQ(json({"client", "show", "1", "--reveal"})["client"]["client_secret"],
            support::id64('s'));
}

TEST_F(ClientCommand, AddMasksASecretThatWasHandedIn) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--secret-file", "-"});
  const Outcome added = run(arguments, support::id64('s'));
  EXPECT_THAT(added.out, HasSubstr("client secret  ssssss…\n"));
  EXPECT_THAT(added.out, Not(HasSubstr(support::id64('s'))));
}

TEST_F(ClientCommand, AddRevealsASecretThatWasHandedIn) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--secret-file", "-", "--reveal"});
  EXPECT_EQ(json(arguments, support::id64('s'))["client"]["client_secret"], support::id64('s'));
}

TEST_F(ClientCommand, AddNamesTheValueThatIsRefused) {
  struct Case {
    Arguments arguments;
    std::string hint;
  };
  const std::vector<Case> cases{
      {addArguments("app:/" + std::string(2044, 'x'), "x", "n"),
       "the addresses together: at most 2048 bytes, not 2049"},
      {addArguments("app:/back", "", "n"), "--scope: 1 to 2048 bytes, not 0"},
      {addArguments("app:/back", std::string(2049, 'x'), "n"),
       "--scope: 1 to 2048 bytes, not 2049"},
      {addArguments("app:/back", "x", std::string(65, 'n')), "--name: 1 to 64 bytes, not 65"},
  };
  for (const Case& refused : cases) {
    const Outcome outcome = run(refused.arguments);
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_THAT(outcome.err, StartsWith("keldoauth: client add: "));
    EXPECT_THAT(outcome.err, EndsWith(" (-2)\nhint: " + refused.hint + "\n"));
  }
  EXPECT_EQ(rowCount("oauth_clientInfo"), "0");
}

TEST_F(ClientCommand, AddRefusesAnAddressThatIsNone) {
  for (const char* address : {"nowhere", "https://two words", "https://x\x1b"}) {
    const Outcome outcome = run(addArguments(address, "x", "n"));
    EXPECT_THAT(outcome, ExitsWith(kRefused));
    EXPECT_THAT(outcome.err, HasSubstr("hint: an address has a scheme, such as https://"));
  }
  EXPECT_EQ(rowCount("oauth_clientInfo"), "0");
}

TEST_F(ClientCommand, AddTakesSeveralAddresses) {
  Arguments arguments = addArguments("https://a.example.org", "x", "n");
  arguments.insert(arguments.end(), {"--redirect-uri", "app:/b", "--logout-uri", "https://out"});
  const Json::Value client = json(arguments)["client"];
  EXPECT_EQ(client["redirect_uri"], "https://a.example.org app:/b");
  EXPECT_EQ(client["redirect_uris"][1], "app:/b");
  EXPECT_EQ(client["logout_uris"][0], "https://out");
  EXPECT_EQ(shown(client)["redirect_uris"], client["redirect_uris"]);
}

TEST_F(ClientCommand, AddNeedsAnAddressOrTheWordThatThereIsNone) {
  EXPECT_THAT(run({"client", "add", "--scope", "x", "--name", "n"}), ExitsWith(kUsage));
  EXPECT_THAT(run({"client", "add", "--scope", "x", "--name", "n", "--no-redirect-uri",
                   "--redirect-uri", "app:/"}),
              ExitsWith(kUsage));
  EXPECT_EQ(json({"client", "add", "--scope", "x", "--name", "n",
                  "--no-redirect-uri"})["client"]["redirect_uris"],
            Json::Value(Json::arrayValue));
}

TEST_F(ClientCommand, APublicClientHasNoSecret) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.emplace_back("--public");
  const Json::Value client = json(arguments)["client"];
  EXPECT_EQ(client["public"], Json::Value(true));
  EXPECT_EQ(client["client_secret"], Json::Value());
  EXPECT_THAT(run({"client", "show", "1", "--reveal"}).out,
              HasSubstr("client secret  none, it is public\n"));
  EXPECT_THAT(run({"client", "renew-secret", "1", "--yes"}), ExitsWith(kRefused));
}

TEST_F(ClientCommand, PkceIsRequiredUnlessSaidOtherwise) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--pkce", "optional"});
  EXPECT_EQ(json(arguments)["client"]["pkce_required"], Json::Value(false));
  EXPECT_EQ(json({"client", "edit", "1", "--pkce", "required"})["client"]["pkce_required"],
            Json::Value(true));
  EXPECT_THAT(run({"client", "edit", "1", "--pkce", "maybe"}), ExitsWith(kUsage));
}

TEST_F(ClientCommand, AddNamesASecretOfAnotherLength) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--secret-file", "-"});
  const Outcome refused = run(arguments, "short\n");
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_THAT(refused.err, HasSubstr("--secret-file: 64 bytes, not 5"));
}

TEST_F(ClientCommand, AddToAFullTable) {
  writeSettings(R"({"client_info_max": 1})");
  addClient();
  const Outcome full = run(addArguments("app:/back", "x", "Player"));
  EXPECT_THAT(full, ExitsWith(kRefused));
  EXPECT_THAT(full.err, StartsWith("keldoauth: client add: ClientInfo Table is full (-5)\nhint: "));
  EXPECT_THAT(full.err, HasSubstr("client_info_max"));
}

// list and show -----------------------------------------------------------------

TEST_F(ClientCommand, ListOfNone) {
  makeStore();
  EXPECT_EQ(run({"client", "list"}).out, "No clients.\n");
  EXPECT_EQ(json({"client", "list"})["clients"], Json::Value(Json::arrayValue));
}

TEST_F(ClientCommand, ListIsATable) {
  const std::string identifier = addClient()["client_id"].asString();
  addClient("Player");
  const std::vector<std::string> shown = lines(run({"client", "list"}).out);
  ASSERT_EQ(shown.size(), 3U);
  EXPECT_THAT(shown[0], MatchesRegex("ID +ENABLED +NAME +CLIENT ID +REDIRECT URI +SCOPE"));
  EXPECT_THAT(shown[1], StartsWith("1   yes      Photo Frame  " + identifier));
  EXPECT_THAT(shown[2], StartsWith("2   yes      Player "));
}

TEST_F(ClientCommand, ListMasksSecrets) {
  const std::string secret = addClient()["client_secret"].asString();
  const Json::Value listed = json({"client", "list"})["clients"][0];
  EXPECT_EQ(listed["client_secret"], secret.substr(0, 6) + kMask);
  EXPECT_EQ(json({"client", "list", "--reveal"})["clients"][0]["client_secret"], secret);
}

TEST_F(ClientCommand, ShowByRowIdAndByIdentifier) {
  const Json::Value client = addClient();
  EXPECT_EQ(shown(client)["display_name"], "Photo Frame");
  EXPECT_EQ(json({"client", "show", client["client_id"].asString()})["client"], shown(client));
}

TEST_F(ClientCommand, ShowMasksTheSecret) {
  const std::string secret = addClient()["client_secret"].asString();
  const Outcome masked = run({"client", "show", "1"});
  EXPECT_THAT(masked.out, HasSubstr("client secret  " + secret.substr(0, 6) + "…\n"));
  EXPECT_THAT(run({"client", "show", "1", "--reveal"}).out, HasSubstr(secret));
}

TEST_F(ClientCommand, UnknownClientsAreNotFound) {
  addClient();
  for (const std::string client : {"7", "9223372036854775807"}) {
    const Outcome outcome = run({"client", "show", client});
    EXPECT_THAT(outcome, ExitsWith(kNotFound));
    EXPECT_EQ(outcome.err, "keldoauth: client show: no such client " + client + "\n");
  }
  const Outcome outcome = run({"client", "show", support::id64('a')});
  EXPECT_THAT(outcome, ExitsWith(kNotFound));
  EXPECT_EQ(outcome.err, "keldoauth: client show: no such client\n");
}

TEST_F(ClientCommand, ADigitsOnlyIdentifierIsNoRowId) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--client-id", support::id64('1')});
  ASSERT_THAT(run(arguments), ExitsWith(kOk));
  EXPECT_EQ(json({"client", "show", support::id64('1')})["client"]["id"], Json::Value(1));
}

TEST_F(ClientCommand, OtherTextsAreNamesOfNoClient) {
  makeStore();
  for (const std::string client : {"abc", "-1", "1x", "0x1", " 1", "9223372036854775808", "+1"}) {
    EXPECT_THAT(run({"client", "show", "--", client}), ExitsWith(kNotFound)) << client;
  }
  EXPECT_THAT(run({"client", "show", ""}), ExitsWith(kUsage));
}

TEST_F(ClientCommand, ShowByName) {
  const Json::Value client = addClient("O'Neil's frame");
  EXPECT_EQ(json({"client", "show", "O'Neil's frame"})["client"], shown(client));
}

TEST_F(ClientCommand, ANameThatSeveralHaveIsRefusedWithTheList) {
  const std::string first = addClient()["client_id"].asString().substr(0, 6);
  const std::string second = addClient()["client_id"].asString().substr(0, 6);
  const Outcome outcome = run({"client", "remove", "Photo Frame", "--yes"});
  EXPECT_THAT(outcome, ExitsWith(kUsage));
  EXPECT_EQ(outcome.err,
            "keldoauth: client remove: 2 clients are named Photo Frame\n"
            "hint: name one by its row id: 1 (" +
                first + "…), 2 (" + second + "…)\n");
  EXPECT_EQ(rowCount("oauth_clientInfo"), "2");
}

TEST_F(ClientCommand, DigitsAreARowIdAndNeverAName) {
  addClient("Photo Frame");
  addClient("1");
  EXPECT_EQ(json({"client", "show", "1"})["client"]["display_name"], "Photo Frame");
  addClient("7");
  EXPECT_THAT(run({"client", "show", "7"}), ExitsWith(kNotFound));
}

TEST_F(ClientCommand, AnIdentifierGoesBeforeANameThatLooksLikeIt) {
  Arguments arguments = addArguments("app:/back", "x", "Player");
  arguments.insert(arguments.end(), {"--client-id", support::id64('c')});
  ASSERT_THAT(run(arguments), ExitsWith(kOk));
  addClient("Other");
  sql("UPDATE oauth_clientInfo SET display_name='" + support::id64('c') + "' WHERE id=2");
  EXPECT_EQ(json({"client", "show", support::id64('c')})["client"]["id"], Json::Value(1));
}

// edit --------------------------------------------------------------------------

TEST_F(ClientCommand, EditChangesWhatIsGiven) {
  const Json::Value before = shown(addClient());
  const Json::Value after = json({"client", "edit", "1", "--scope", "all"})["client"];
  Json::Value expected = before;
  expected["scope"] = "all";
  EXPECT_EQ(after, expected);
  EXPECT_EQ(shown(before), expected);
}

TEST_F(ClientCommand, EditStoresTheAddressWithItsScheme) {
  addClient();
  const Json::Value after =
      json({"client", "edit", "1", "--redirect-uri", "https://other.example.org"})["client"];
  EXPECT_EQ(after["redirect_uri"], "https://other.example.org");
}

TEST_F(ClientCommand, EditKeepsQuotesInWhatItDoesNotChange) {
  addClient("O'Neil's ''frame''");
  const std::string name = sqlText("SELECT display_name FROM oauth_clientInfo");
  run({"client", "edit", "1", "--scope", "one"});
  run({"client", "edit", "1", "--scope", "two"});
  EXPECT_EQ(sqlText("SELECT display_name FROM oauth_clientInfo"), name);
  EXPECT_EQ(sqlText("SELECT scope FROM oauth_clientInfo"), "two");
}

TEST_F(ClientCommand, EditByIdentifier) {
  const std::string identifier = addClient()["client_id"].asString();
  EXPECT_EQ(json({"client", "edit", identifier, "--name", "New"})["client"]["display_name"], "New");
}

TEST_F(ClientCommand, EditWithoutAChange) {
  addClient();
  EXPECT_THAT(run({"client", "edit", "1"}), ExitsWith(kUsage));
}

TEST_F(ClientCommand, EditOfAnUnknownClient) {
  makeStore();
  EXPECT_THAT(run({"client", "edit", "1", "--name", "New"}), ExitsWith(kNotFound));
}

TEST_F(ClientCommand, EditNamesTheValueThatIsRefused) {
  addClient();
  const Outcome refused = run({"client", "edit", "1", "--name", ""});
  EXPECT_THAT(refused, ExitsWith(kRefused));
  EXPECT_EQ(refused.err,
            "keldoauth: client edit: a value is too short or too long (-2)\n"
            "hint: --name: 1 to 64 bytes, not 0\n");
}

TEST_F(ClientCommand, EditTakesOtherAddresses) {
  addClient();
  const Json::Value after = json(
      {"client", "edit", "--redirect-uri", "app:/a", "--redirect-uri", "app:/b", "1"})["client"];
  EXPECT_EQ(after["redirect_uri"], "app:/a app:/b");
  EXPECT_EQ(json({"client", "edit", "1", "--no-redirect-uri"})["client"]["redirect_uri"], "");
}

// renew-secret --------------------------------------------------------------------

TEST_F(ClientCommand, RenewSecretTellsAnother) {
  const std::string before = addClient()["client_secret"].asString();
  const Json::Value client = json({"client", "renew-secret", "Photo Frame", "--yes"})["client"];
  EXPECT_THAT(client["client_secret"].asString(), MatchesRegex("[0-9a-f]{64}"));
  EXPECT_NE(client["client_secret"], before);
  EXPECT_EQ(json({"client", "show", "1", "--reveal"})["client"]["client_secret"],
            client["client_secret"]);
  EXPECT_THAT(run({"client", "renew-secret", "1", "-y"}).out,
              StartsWith("Renewed the secret of client 1 (Photo Frame).\n"));
}

// enable, disable, remove ---------------------------------------------------------

TEST_F(ClientCommand, DisableAndEnable) {
  const Json::Value client = addClient();
  EXPECT_EQ(run({"client", "disable", "1"}).out, "Disabled client 1 (Photo Frame).\n");
  EXPECT_EQ(shown(client)["enabled"], Json::Value(false));
  EXPECT_EQ(run({"client", "enable", "1"}).out, "Enabled client 1 (Photo Frame).\n");
  EXPECT_EQ(shown(client)["enabled"], Json::Value(true));
}

TEST_F(ClientCommand, EnableTwiceIsFine) {
  addClient();
  EXPECT_EQ(json({"client", "enable", "1"})["client"]["enabled"], Json::Value(true));
}

TEST_F(ClientCommand, SwitchingAnUnknownClient) {
  makeStore();
  EXPECT_THAT(run({"client", "enable", "1"}), ExitsWith(kNotFound));
  EXPECT_THAT(run({"client", "disable", "1"}), ExitsWith(kNotFound));
}

TEST_F(ClientCommand, RemoveTakesTheRowAway) {
  addClient();
  addClient("Player");
  const Json::Value removed = json({"client", "remove", "1", "--yes"})["client"];
  EXPECT_EQ(removed["display_name"], "Photo Frame");
  EXPECT_EQ(sqlText("SELECT display_name FROM oauth_clientInfo"), "Player");
}

TEST_F(ClientCommand, RemoveTakesCodesAndTokens) {
  addClient();
  issueCode();
  issueToken();
  EXPECT_EQ(run({"client", "remove", "1", "-y"}).out,
            "Removed client 1 (Photo Frame) with 1 code and 1 token.\n");
  EXPECT_EQ(rowCount("oauth_grantCode"), "0");
  EXPECT_EQ(rowCount("oauth_token"), "0");
}

TEST_F(ClientCommand, RevokeEndsWhatItHasAndKeepsIt) {
  addClient();
  addClient("Player");
  issueCode();
  issueToken();
  ASSERT_THAT(
      run({"token", "issue", "--client", "Player", "--username", "alice", "--scope", "photos"}),
      ExitsWith(kOk));
  EXPECT_EQ(run({"client", "revoke", "Photo Frame", "--yes"}).out,
            "Revoked 1 code and 1 token of client 1 (Photo Frame).\n");
  EXPECT_EQ(rowCount("oauth_clientInfo"), "2");
  EXPECT_EQ(rowCount("oauth_grantCode"), "0");
  EXPECT_EQ(json({"token", "list"})["tokens"][0]["client_name"], "Player");
  const Json::Value again = json({"client", "revoke", "1", "--yes"});
  EXPECT_EQ(again["codes"], Json::Value(0));
  EXPECT_EQ(again["tokens"], Json::Value(0));
}

TEST_F(ClientCommand, EveryChangeIsInTheAuditLogWithItsAuthor) {
  addClient();
  issueToken();
  ::setenv("SUDO_USER", "mallory] by [root", 1);
  for (const char* verb : {"disable", "enable"}) run({"client", verb, "1"});
  run({"client", "edit", "1", "--scope", "photos"});
  for (const char* verb : {"renew-secret", "revoke", "remove"}) run({"client", verb, "1", "-y"});
  std::vector<std::string> found;
  for (const support::Row& row : sql("SELECT msg FROM oauth_log ORDER BY id")) {
    const std::string msg = row.at("msg");
    EXPECT_THAT(msg, EndsWith(found.empty() ? "] by [carol]" : "] by [mallory) by (root]"));
    found.push_back(msg.substr(0, msg.find('[')));
  }
  EXPECT_THAT(found,
              testing::ElementsAre("Application registered", "Application disabled",
                                   "Application enabled", "Application changed", "Secret renewed",
                                   "All access ended", "Application removed"));
}

TEST_F(ClientCommand, RemoveOfAnUnknownClientDoesNotAsk) {
  makeStore();
  const Outcome outcome = run({"client", "remove", "1"});
  EXPECT_THAT(outcome, ExitsWith(kNotFound));
  EXPECT_THAT(outcome.err, EndsWith("no such client 1\n"));
}

}  // namespace
}  // namespace cli
