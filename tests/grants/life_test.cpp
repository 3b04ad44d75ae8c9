// A login from registration to its end with hostile texts in every argument,
// compared byte by byte, and what a copy of the file is good for at any moment.

#include <algorithm>
#include <set>

#include "tests/grants/grants_test.h"
#include "tests/support/case_name.h"

namespace grants_test {
namespace {

struct Texts {
  std::string name;
  std::string text;
};

std::vector<Texts> everyHostileText() {
  return {
      {"OneQuote", "O'Brien"},
      {"QuotesInARow", "''a''''b'"},
      {"Injection", "x'); DELETE FROM oauth_token; --"},
      {"LikeWildcards", "%_\\%"},
      {"Brackets", "a] by [root"},
      {"Controls", "a\x01\t\r\n\x1b[0mb\x7f"},
      {"Bidirectional",
       "\xe2\x80\xae"
       "evil\xe2\x80\xac"},
      {"NotUtf8", "\xff\xfe\xc0\x80\xed\xa0\x80"},
      {"Emoji", "👪\xef\xb8\x8f"},
      {"NumbersAndColons", "3:abc12:c1s1t1"},
      {"Mark", "sha256:0123456789abcdef"},
      {"DoubleQuotes", "\"`[x];"},
      {"Words", "(none) (self)"},
  };
}

class LifeTest : public GrantsTest, public ::testing::WithParamInterface<Texts> {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    NewApplication application{ApplicationName(text_), {address_}, Scope(text_ + " more")};
    application.logoutAddresses = {LogoutAddress("app:it's(bye)")};
    frame_ = grants().applications.add(application, Actor(text_))->identifier;
  }

  CodeRequest asked() const {
    CodeRequest request{User(text_), frame_, Scope(text_ + " more"), address_};
    request.pkce = Pkce{Challenge(text_), Pkce::Method::kPlain};
    request.text = CallerText(text_);
    return request;
  }
  Pair login() {
    const auto code = grants().codes.issue(asked());
    return *grants().codes.redeem({frame_, code->code, address_, Verifier(text_)});
  }

  const std::string text_ = GetParam().text;
  const RedirectAddress address_{"https://photos.example/it's?x=''&y=(none)"};
  ApplicationId frame_;
};

TEST_P(LifeTest, TextsComeBackAsTheyWereAfterTenRefreshes) {
  Pair pair = login();
  for (int i = 0; i < 10; ++i) {
    std::optional<Scope> scope;
    if (i % 2 == 0) scope = Scope(text_);
    pair = *grants().tokens.refresh({frame_, *pair.refresh, scope});
    EXPECT_EQ(pair.user, User(text_));
    EXPECT_EQ(pair.text, CallerText(text_));
    EXPECT_EQ(pair.scope, Scope(i % 2 == 0 ? text_ : text_ + " more"));
  }
  const auto bearer = grants().tokens.verify(pair.access);
  ASSERT_TRUE(bearer);
  EXPECT_EQ(bearer->user, User(text_));
  EXPECT_EQ(bearer->scope, Scope(text_ + " more"));
  EXPECT_EQ(bearer->text, CallerText(text_));
  EXPECT_EQ(bearer->applicationName, ApplicationName(text_));
}

TEST_P(LifeTest, AnApplicationIsFoundByItsName) {
  const auto found = grants().applications.named(ApplicationName(text_));
  ASSERT_EQ(found.size(), 1U);
  EXPECT_EQ(found[0].name, ApplicationName(text_));
  EXPECT_EQ(found[0].scope, Scope(text_ + " more"));
  EXPECT_EQ(found[0].addresses, std::vector<RedirectAddress>{address_});
  EXPECT_EQ(found[0].logoutAddresses, std::vector<LogoutAddress>{LogoutAddress("app:it's(bye)")});
}

TEST_P(LifeTest, AUserIsListedAndLoggedOut) {
  const Pair pair = login();
  const Pair bobs = *grants().tokens.issue({kBob, frame_, Scope("more")});
  const auto entries = grants().access.list({User(text_)});
  ASSERT_EQ(entries.size(), 1U);
  EXPECT_EQ(entries[0].user, User(text_));
  EXPECT_EQ(entries[0].text, CallerText(text_));
  EXPECT_EQ(grants().access.endUser(User(text_), Actor(text_)).tokens, 1);
  EXPECT_FALSE(isGood(pair));
  EXPECT_TRUE(isGood(bobs));
}

TEST_P(LifeTest, NoEntryOfTheLogIsBroken) {
  login();
  grants().access.endUser(User(text_), Actor(text_));
  grants().applications.remove(frame_, Actor(text_));
  const std::vector<std::string> all = this->entries();
  ASSERT_EQ(all.size(), 3U);
  for (const std::string& entry : all) {
    EXPECT_EQ(entry.find_first_of("\n\r\t\x1b\x7f"), std::string::npos) << entry;
    EXPECT_EQ(std::count(entry.begin(), entry.end(), '['), 2) << entry;
    EXPECT_EQ(std::count(entry.begin(), entry.end(), ']'), 2) << entry;
  }
}

INSTANTIATE_TEST_SUITE_P(EveryText, LifeTest, ::testing::ValuesIn(everyHostileText()),
                         support::CaseName());

// A NUL byte ------------------------------------------------------------------------

class NulTest : public GrantsTest {
 protected:
  void SetUp() override {
    GrantsTest::SetUp();
    frame_ = add().identifier;
    pair_ = login(frame_);
    before_ = snapshot();
  }
  static std::string snapshot() { return readFile(kDatabase); }
  template <typename Value>
  void expectRefused(const Outcome<Value>& outcome) {
    EXPECT_FALSE(outcome);
    EXPECT_EQ(snapshot(), before_);
  }

  const std::string nul_ = std::string("alice\0", 6);
  const std::string nul64_ = std::string(63, 'a') + '\0';
  ApplicationId frame_;
  Pair pair_;
  std::string before_;
};

TEST_F(NulTest, IsRefusedInACodeRequest) {
  const auto with = [&](auto change) {
    CodeRequest asked = request(frame_);
    change(asked);
    expectRefused(grants().codes.issue(asked));
  };
  with([&](auto& r) { r.user = User(nul_); });
  with([&](auto& r) { r.application = ApplicationId(nul64_); });
  with([&](auto& r) { r.scope = Scope(nul_); });
  with([&](auto& r) { r.redirect = RedirectAddress(nul_); });
  with([&](auto& r) { r.pkce->challenge = Challenge(nul_); });
  with([&](auto& r) { r.text = CallerText(nul_); });
  with([&](auto& r) { r.from = PeerAddress(std::string("::1\0", 4)); });
}

TEST_F(NulTest, IsRefusedInWhatIsShown) {
  auto& tokens = grants().tokens;
  expectRefused(tokens.verify(AccessToken(pair_.access.text() + '\0')));
  expectRefused(tokens.refresh({frame_, RefreshToken(pair_.refresh->text() + '\0')}));
  expectRefused(tokens.refresh({frame_, *pair_.refresh, Scope(std::string("profile\0", 8))}));
  expectRefused(grants().codes.redeem({frame_, Code(nul64_)}));
  expectRefused(grants().codes.redeem({frame_, Code("x"), RedirectAddress(nul_)}));
  expectRefused(grants().codes.redeem({frame_, Code("x"), kAddress, Verifier(nul_)}));
  expectRefused(tokens.issueToItself({frame_, Scope(std::string("profile\0", 8))}));
  expectRefused(tokens.issue({User(nul_), frame_, kScope}));
  EXPECT_FALSE(tokens.introspect(frame_, AnyToken(pair_.access.text() + '\0')));
  EXPECT_FALSE(tokens.revoke(frame_, AnyToken(pair_.access.text() + '\0'))->wasThere);
  EXPECT_TRUE(isGood(pair_));
}

TEST_F(NulTest, IsRefusedInTheRegistry) {
  const auto with = [&](auto change) {
    NewApplication application{ApplicationName("n"), {kAddress}, kScope};
    change(application);
    expectRefused(grants().applications.add(application, kAdmin));
  };
  with([&](auto& a) { a.name = ApplicationName(nul_); });
  with([&](auto& a) { a.scope = Scope(nul_); });
  with([&](auto& a) { a.addresses = {RedirectAddress("a:" + nul_)}; });
  with([&](auto& a) { a.logoutAddresses = {LogoutAddress("a:" + nul_)}; });
  with([&](auto& a) { a.identifier = ApplicationId(nul64_); });
  with([&](auto& a) { a.secret = Secret(nul64_); });
  expectRefused(grants().applications.disable(ApplicationId(nul64_), kAdmin));
}

TEST_F(NulTest, EndsNobodysAccess) {
  EXPECT_EQ(grants().access.endUser(User(nul_), kAdmin).tokens, 0);
  EXPECT_EQ(grants().access.endUserWith(User(nul_), frame_, kAdmin).tokens, 0);
  EXPECT_EQ(grants().access.endApplication(ApplicationId(nul64_), kAdmin).tokens, 0);
  EXPECT_TRUE(isGood(pair_));
}

// At rest ---------------------------------------------------------------------------

class AtRestTest : public GrantsTest {
 protected:
  /// Every text of the file, whole, and what stands between separators in it.
  static std::set<std::string> everyText() {
    std::set<std::string> texts;
    for (const char* table : {"oauth_clientInfo", "oauth_grantCode", "oauth_token", "oauth_log"}) {
      for (const auto& row : sql("SELECT * FROM " + std::string(table))) {
        for (const auto& [column, text] : row) {
          texts.insert(text);
          for (std::size_t i = 0; i < text.size(); ++i) {
            for (const std::size_t length : {57U, 64U, 105U}) texts.insert(text.substr(i, length));
          }
        }
      }
    }
    return texts;
  }

  void expectNothingOpens(const ApplicationId& application) {
    for (const std::string& text : everyText()) {
      EXPECT_FALSE(grants().tokens.verify(AccessToken(text))) << text;
      EXPECT_FALSE(grants().tokens.introspect(application, AnyToken(text))) << text;
      EXPECT_FALSE(grants().tokens.refresh({application, RefreshToken(text)})) << text;
      EXPECT_FALSE(grants().codes.redeem(redemption(application, Code(text)))) << text;
      EXPECT_FALSE(grants().pushed.open(application, RequestReference(text))) << text;
      EXPECT_FALSE(grants().tokens.revoke(application, AnyToken(text))->wasThere) << text;
      EXPECT_FALSE(grants().applications.authenticate(application, Secret(text))) << text;
    }
  }
};

TEST_F(AtRestTest, NoStoredTextIsOfAnyUse) {
  const ApplicationId frame = add().identifier;
  const Code code = issue(frame);
  Pair pair = login(frame);
  pair = refresh(frame, pair);
  const Pair own = *grants().tokens.issueToItself({frame});
  const RequestReference pushed = grants().pushed.push({frame, RequestText("state=1")})->reference;
  expectNothingOpens(frame);
  EXPECT_TRUE(grants().pushed.open(frame, pushed));
  EXPECT_TRUE(isGood(pair));
  EXPECT_TRUE(isGood(own));
  EXPECT_TRUE(grants().codes.redeem(redemption(frame, code)));
}

TEST_F(AtRestTest, NoSecretStandsInTheFile) {
  const Registered frame = add();
  const Code code = issue(frame.identifier);
  const Pair first = login(frame.identifier);
  const Pair pair = refresh(frame.identifier, first);
  const RequestReference pushed =
      grants().pushed.push({frame.identifier, RequestText("state=1")})->reference;
  const std::string file = readFile(kDatabase);
  for (const std::string& text :
       {code.text(), first.access.text(), first.refresh->text(), pair.access.text(),
        pair.refresh->text(), pair.refresh->text().substr(17, 40),
        pair.refresh->text().substr(57, 40), frame.secret->text(), pushed.text()}) {
    EXPECT_EQ(file.find(text), std::string::npos);
  }
}

}  // namespace
}  // namespace grants_test
