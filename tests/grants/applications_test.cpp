// The registry: registering, looking up, changing, removing.

#include "grants/applications.h"

#include "stores/oauth_clientInfo.h"
#include "tests/grants/grants_test.h"
#include "utils/oauth_names.h"

namespace grants_test {
namespace {

namespace names = KELDOAUTHSERVER::names;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::StartsWith;

class ApplicationsTest : public GrantsTest {
 protected:
  NewApplication photos() const {
    return {ApplicationName("O'Brien's \"Frame\""), {kAddress}, Scope("it's all")};
  }
  Outcome<Registered> tryToAdd(const NewApplication& application) {
    return grants().applications.add(application, kAdmin);
  }
  Application found(const ApplicationId& identifier) {
    return grants().applications.find(identifier).value();
  }
};

// Registering -------------------------------------------------------------------

TEST_F(ApplicationsTest, AnApplicationComesBackAsItWasRegistered) {
  NewApplication application = photos();
  application.logoutAddresses = {LogoutAddress("https://photos.example.org/bye")};
  application.needsPkce = false;
  const auto registered = tryToAdd(application);
  ASSERT_TRUE(registered);

  const Application shown = found(registered->identifier);
  EXPECT_EQ(shown.name, application.name);
  EXPECT_EQ(shown.scope, application.scope);
  EXPECT_EQ(shown.kind, ApplicationKind::kConfidential);
  EXPECT_TRUE(shown.isEnabled);
  EXPECT_FALSE(shown.needsPkce);
  EXPECT_FALSE(shown.registeredItself);
  EXPECT_THAT(shown.addresses, ElementsAre(kAddress));
  EXPECT_THAT(shown.logoutAddresses, ElementsAre(LogoutAddress("https://photos.example.org/bye")));
}

TEST_F(ApplicationsTest, AddressesAreStoredWithTheirScheme) {
  add();
  EXPECT_EQ(sqlText("SELECT redirect_uri FROM oauth_clientInfo"), kAddress.text());
}

/// RFC 8252, 7.1 to 7.3.
TEST_F(ApplicationsTest, AddressesOfNativeApplicationsAreStoredAsTheyAre) {
  std::vector<RedirectAddress> addresses;
  for (const char* address :
       {"com.example.app:/callback", "com.example.app:/oauth2redirect/example-provider",
        "com.example.app:callback", "com.example.app://callback", "https://app.example.com/a?b=c",
        "http://127.0.0.1/callback", "http://127.0.0.1:51004/", "http://[::1]/callback",
        "http://[::1]:65535/callback", "http://localhost:0/callback",
        "urn:ietf:wg:oauth:2.0:oob"}) {
    addresses.emplace_back(address);
  }
  for (const ApplicationKind kind : {ApplicationKind::kPublic, ApplicationKind::kConfidential}) {
    NewApplication application = photos();
    application.kind = kind;
    application.addresses = addresses;
    const auto registered = tryToAdd(application);
    ASSERT_TRUE(registered) << wordOf(registered);
    EXPECT_EQ(found(registered->identifier).addresses, addresses);

    ApplicationChange change;
    change.addresses = {addresses.rbegin(), addresses.rend()};
    ASSERT_TRUE(grants().applications.change(registered->identifier, change, kAdmin));
    EXPECT_EQ(found(registered->identifier).addresses, *change.addresses);
  }
}

TEST_F(ApplicationsTest, ACodeGoesToANativeApplicationsAddressAndBack) {
  const ApplicationId app = add("App", ApplicationKind::kPublic).identifier;
  for (const char* address : {"com.example.app:/callback", "http://127.0.0.1:51004/callback"}) {
    CodeRequest asked = request(app);
    asked.redirect = RedirectAddress(address);
    const auto issued = grants().codes.issue(asked);
    ASSERT_TRUE(issued);
    EXPECT_EQ(whyOf(grants().codes.redeem({app, issued->code, kAddress, kVerifier})),
              Why::kWrongAddress);
    EXPECT_TRUE(grants().codes.redeem({app, issued->code, asked.redirect, kVerifier}));
  }
}

TEST_F(ApplicationsTest, WhatIsNoAddressIsRefused) {
  for (const char* address : {"", "callback", "/callback", "com.example.app:", "1app:/callback",
                              "https://a b/", "https://a.example/\"", "https://a.example/\x7f"}) {
    NewApplication application = photos();
    application.addresses = {RedirectAddress(address)};
    EXPECT_EQ(whyOf(tryToAdd(application)), Why::kBadAddress) << address;
  }
}

TEST_F(ApplicationsTest, IdentifierAndSecretAreDrawn) {
  const Registered one = add();
  const Registered other = add();
  EXPECT_EQ(one.identifier.text().size(), 64U);
  EXPECT_EQ(one.secret->text().size(), 64U);
  EXPECT_NE(one.identifier, other.identifier);
  EXPECT_NE(*one.secret, *other.secret);
}

TEST_F(ApplicationsTest, IdentifierAndSecretCanBeGiven) {
  NewApplication application = photos();
  application.identifier = ApplicationId(support::id64('i'));
  application.secret = Secret(support::id64('s'));
  ASSERT_TRUE(tryToAdd(application));
  EXPECT_TRUE(grants().applications.authenticate(ApplicationId(support::id64('i')),
                                                 Secret(support::id64('s'))));
}

TEST_F(ApplicationsTest, AnIdentifierIsGivenOnce) {
  NewApplication application = photos();
  application.identifier = ApplicationId(support::id64('i'));
  ASSERT_TRUE(tryToAdd(application));
  const auto again = tryToAdd(application);
  EXPECT_EQ(errorOf(again), Error::kInvalidClientMetadata);
  EXPECT_EQ(whyOf(again), Why::kTaken);
}

TEST_F(ApplicationsTest, ANameLikeAnIdentifierIsRefused) {
  NewApplication application = photos();
  application.name = ApplicationName(support::id64('a'));
  EXPECT_EQ(whyOf(tryToAdd(application)), Why::kNameIsIdentifier);
}

TEST_F(ApplicationsTest, BoundsAreKept) {
  const auto whyWith = [this](auto change) {
    NewApplication application = photos();
    change(application);
    return whyOf(tryToAdd(application));
  };
  EXPECT_EQ(whyWith([](auto& a) { a.name = ApplicationName(""); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.name = ApplicationName(std::string(65, ' ')); }),
            Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.scope = Scope(""); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.scope = Scope(std::string(2049, 's')); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.secret = Secret("short"); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.identifier = ApplicationId("short"); }), Why::kOutOfBounds);
  EXPECT_EQ(whyWith([](auto& a) { a.addresses = {RedirectAddress("/no-scheme")}; }),
            Why::kBadAddress);
  EXPECT_EQ(whyWith([](auto& a) { a.logoutAddresses = {LogoutAddress("https://a b")}; }),
            Why::kBadAddress);
}

TEST_F(ApplicationsTest, AddressesTogetherFitTheirColumn) {
  NewApplication application = photos();
  application.addresses = {RedirectAddress("a:" + std::string(1000, 'x')),
                           RedirectAddress("b:" + std::string(1000, 'x'))};
  EXPECT_TRUE(tryToAdd(application));
  application.logoutAddresses = {LogoutAddress("c:" + std::string(40, 'x'))};
  const auto refused = tryToAdd(application);
  EXPECT_EQ(errorOf(refused), Error::kInvalidRedirectUri);
  EXPECT_EQ(whyOf(refused), Why::kTooMuch);
}

TEST_F(ApplicationsTest, ChangedAddressesTogetherFitTheirColumn) {
  const auto added = tryToAdd(photos());
  ApplicationChange change;
  change.addresses = {RedirectAddress("a:" + std::string(1000, 'x')),
                      RedirectAddress("b:" + std::string(1000, 'x'))};
  change.logoutAddresses = {LogoutAddress("c:" + std::string(40, 'x'))};
  const auto refused = grants().applications.change(added->identifier, change, kAdmin);
  EXPECT_EQ(errorOf(refused), Error::kInvalidRedirectUri);
  EXPECT_EQ(whyOf(refused), Why::kTooMuch);
}

TEST_F(ApplicationsTest, ChangedNameAndScopeKeepTheirBounds) {
  const ApplicationId id = add().identifier;
  const Application before = found(id);
  const auto whyWith = [&](const std::string& name, const std::string& scope) {
    ApplicationChange change;
    change.name = ApplicationName(name);
    change.scope = Scope(scope);
    return whyOf(grants().applications.change(id, change, kAdmin));
  };
  EXPECT_EQ(whyWith("Album", ""), Why::kOutOfBounds);
  EXPECT_EQ(whyWith("Album", std::string(2049, 's')), Why::kOutOfBounds);
  EXPECT_EQ(whyWith("", "read"), Why::kOutOfBounds);
  EXPECT_EQ(whyWith(support::id64('a'), ""), Why::kNameIsIdentifier);
  EXPECT_EQ(found(id).name, before.name);
  EXPECT_EQ(found(id).scope, before.scope);
}

TEST_F(ApplicationsTest, ASecretCannotMakeAnApplicationPublic) {
  NewApplication application = photos();
  application.secret = Secret("public:" + std::string(57, 'x'));
  EXPECT_EQ(whyOf(tryToAdd(application)), Why::kOutOfBounds);
}

TEST_F(ApplicationsTest, AFullRegistryIsTrouble) {
  writeSettings(R"({"client_info_max": 1})");
  add();
  try {
    add();
    ADD_FAILURE() << "no trouble";
  } catch (const Trouble& trouble) {
    EXPECT_EQ(trouble.kind(), Trouble::Kind::kFull);
    EXPECT_FALSE(trouble.canTryAgain());  // full, not busy
  }
  EXPECT_EQ(support::SystemLog::count("ClientInfo Table is full"), 1);
}

TEST_F(ApplicationsTest, RegisteringLeavesOneEntry) {
  const Registered frame = add();
  EXPECT_THAT(entries(), ElementsAre("Application registered[Photo Frame " +
                                     frame.identifier.text().substr(0, 8) + "] by [admin]"));
}

TEST_F(ApplicationsTest, NothingIsRegisteredWithoutItsEntry) {
  sql("CREATE TRIGGER refuse BEFORE INSERT ON oauth_log BEGIN SELECT RAISE(ABORT, 'no'); END;");
  EXPECT_THROW(add(), Trouble);
  EXPECT_THAT(grants().applications.all(), IsEmpty());
}

// Public applications -------------------------------------------------------------

TEST_F(ApplicationsTest, APublicApplicationHasNoSecret) {
  const Registered app = add("App", ApplicationKind::kPublic);
  EXPECT_FALSE(app.secret);
  EXPECT_FALSE(grants().applications.secretOf(app.identifier));
  EXPECT_EQ(found(app.identifier).kind, ApplicationKind::kPublic);
  EXPECT_TRUE(grants().applications.authenticate(app.identifier, {}));
}

TEST_F(ApplicationsTest, APublicApplicationThatShowsASecretIsRefused) {
  const Registered app = add("App", ApplicationKind::kPublic);
  for (const std::string& secret : {std::string(), support::id64('x')}) {
    const auto refused = grants().applications.authenticate(app.identifier, Secret(secret));
    EXPECT_EQ(errorOf(refused), Error::kInvalidClient);
    EXPECT_EQ(whyOf(refused), Why::kWrongSecret);
  }
}

TEST_F(ApplicationsTest, AChangeMakesNoPublicApplicationGoWithoutPkce) {
  const Registered app = add("App", ApplicationKind::kPublic);
  ApplicationChange change;
  change.needsPkce = false;
  ASSERT_TRUE(grants().applications.change(app.identifier, change, kAdmin));
  EXPECT_TRUE(found(app.identifier).needsPkce);
}

TEST_F(ApplicationsTest, APublicApplicationAlwaysNeedsPkce) {
  NewApplication application = photos();
  application.kind = ApplicationKind::kPublic;
  application.needsPkce = false;
  EXPECT_TRUE(found(tryToAdd(application)->identifier).needsPkce);
}

TEST_F(ApplicationsTest, WhatStandsInPlaceOfASecretOpensNothing) {
  const Registered app = add("App", ApplicationKind::kPublic);
  Json::Value rows;
  KELDOAUTHSERVER::OAUTHDBClientInfo(names::kClientInfoTable).Get(app.identifier.text(), &rows);
  const std::string secret = rows[0U][names::kClientSecret].asString();
  EXPECT_THAT(secret, StartsWith("public:"));
  EXPECT_EQ(secret.size(), 64U);
  EXPECT_EQ(whyOf(grants().applications.authenticate(app.identifier, Secret(secret))),
            Why::kWrongSecret);
}

TEST_F(ApplicationsTest, ThePublicHasNoSecretToRenew) {
  const auto refused =
      grants().applications.renewSecret(add("App", ApplicationKind::kPublic).identifier, kAdmin);
  EXPECT_EQ(errorOf(refused), Error::kUnauthorizedClient);
}

// Looking up ----------------------------------------------------------------------

TEST_F(ApplicationsTest, AnUnknownIdentifierIsNoApplication) {
  EXPECT_FALSE(grants().applications.find(ApplicationId(support::id64('x'))));
  EXPECT_FALSE(grants().applications.find(ApplicationId("short")));
}

TEST_F(ApplicationsTest, SeveralCanHaveOneName) {
  add("It's");
  add("It's");
  add("Other");
  EXPECT_EQ(grants().applications.named(ApplicationName("It's")).size(), 2U);
  EXPECT_THAT(grants().applications.named(ApplicationName("None")), IsEmpty());
  EXPECT_EQ(grants().applications.all().size(), 3U);
}

TEST_F(ApplicationsTest, TheRegistrysOwnRowsAreRead) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBClientInfo(names::kClientInfoTable)
      .Add("https://old.example/it's", "it's", "O'Old", out);
  const Application old = found(ApplicationId(out[names::kClientId].asString()));
  EXPECT_EQ(old.name.text(), "O'Old");
  EXPECT_THAT(old.addresses, ElementsAre(RedirectAddress("old.example/it's")));
  EXPECT_TRUE(old.needsPkce);
}

TEST_F(ApplicationsTest, ARowThatCannotBeDecryptedIsTrouble) {
  const Registered frame = add();
  support::Platform::failDecryptFrom(1);
  try {
    grants().applications.find(frame.identifier);
    ADD_FAILURE() << "no trouble";
  } catch (const Trouble& trouble) {
    EXPECT_EQ(trouble.kind(), Trouble::Kind::kCipher);
  }
  support::Platform::release();
}

// Authenticating --------------------------------------------------------------------

TEST_F(ApplicationsTest, TheRightSecretIsNeeded) {
  const Registered frame = add();
  const auto with = [&](const std::optional<Secret>& secret) {
    return grants().applications.authenticate(frame.identifier, secret);
  };
  EXPECT_TRUE(with(frame.secret));
  EXPECT_EQ(whyOf(with({})), Why::kWrongSecret);
  EXPECT_EQ(whyOf(with(Secret(support::id64('x')))), Why::kWrongSecret);
  EXPECT_EQ(errorOf(with(Secret(""))), Error::kInvalidClient);
}

TEST_F(ApplicationsTest, ADisabledOneIsRefusedUntilItIsEnabled) {
  const Registered frame = add();
  ASSERT_TRUE(grants().applications.disable(frame.identifier, kAdmin));
  EXPECT_EQ(whyOf(grants().applications.authenticate(frame.identifier, frame.secret)),
            Why::kDisabled);
  ASSERT_TRUE(grants().applications.enable(frame.identifier, kAdmin));
  EXPECT_TRUE(grants().applications.authenticate(frame.identifier, frame.secret));
}

TEST_F(ApplicationsTest, ARenewedSecretReplacesTheOldOne) {
  const Registered frame = add();
  const auto renewed = grants().applications.renewSecret(frame.identifier, kAdmin);
  ASSERT_TRUE(renewed);
  EXPECT_FALSE(grants().applications.authenticate(frame.identifier, frame.secret));
  EXPECT_TRUE(grants().applications.authenticate(frame.identifier, *renewed));
  EXPECT_EQ(grants().applications.secretOf(frame.identifier), *renewed);
}

// Changing --------------------------------------------------------------------------

TEST_F(ApplicationsTest, OnlyWhatIsGivenChanges) {
  NewApplication application = photos();
  application.logoutAddresses = {LogoutAddress("https://photos.example.org/bye")};
  application.wantsEs256 = true;
  const ApplicationId identifier = tryToAdd(application)->identifier;
  ApplicationChange change;
  change.addresses = {RedirectAddress("https://new.example/")};
  const auto changed = grants().applications.change(identifier, change, kAdmin);
  ASSERT_TRUE(changed);
  EXPECT_THAT(changed->addresses, ElementsAre(RedirectAddress("https://new.example/")));
  EXPECT_EQ(changed->name, application.name);
  EXPECT_EQ(changed->scope, application.scope);
  EXPECT_EQ(changed->logoutAddresses, application.logoutAddresses);
  EXPECT_TRUE(changed->needsPkce);
  EXPECT_TRUE(changed->wantsEs256);
}

TEST_F(ApplicationsTest, AnotherProgramsAddressesStayAsTheyAre) {
  Json::Value out;
  KELDOAUTHSERVER::OAUTHDBClientInfo(names::kClientInfoTable)
      .Add("https://old.example/", "s", "Old", out);
  ApplicationChange change;
  change.needsPkce = false;
  const auto changed =
      grants().applications.change(ApplicationId(out[names::kClientId].asString()), change, kAdmin);
  ASSERT_TRUE(changed);
  EXPECT_EQ(sqlText("SELECT redirect_uri FROM oauth_clientInfo"), "old.example/ (pkce-optional)");
}

TEST_F(ApplicationsTest, ChangesHaveTheSameBounds) {
  const Registered frame = add();
  ApplicationChange change;
  change.name = ApplicationName("");
  EXPECT_EQ(whyOf(grants().applications.change(frame.identifier, change, kAdmin)),
            Why::kOutOfBounds);
  EXPECT_EQ(found(frame.identifier).name.text(), "Photo Frame");
}

TEST_F(ApplicationsTest, WhatIsNotRegisteredCannotBeChanged) {
  const ApplicationId nobody(support::id64('x'));
  auto& applications = grants().applications;
  EXPECT_EQ(whyOf(applications.change(nobody, {}, kAdmin)), Why::kNoApplication);
  EXPECT_EQ(whyOf(applications.renewSecret(nobody, kAdmin)), Why::kNoApplication);
  EXPECT_EQ(whyOf(applications.enable(nobody, kAdmin)), Why::kNoApplication);
  EXPECT_EQ(whyOf(applications.disable(nobody, kAdmin)), Why::kNoApplication);
  EXPECT_EQ(whyOf(applications.remove(nobody, kAdmin)), Why::kNoApplication);
  EXPECT_THAT(entries(), IsEmpty());
}

TEST_F(ApplicationsTest, EachChangeLeavesItsEntry) {
  const Registered frame = add();
  auto& applications = grants().applications;
  ApplicationChange change;
  change.name = ApplicationName("Frame 2");
  applications.change(frame.identifier, change, kAdmin);
  applications.renewSecret(frame.identifier, kAdmin);
  applications.disable(frame.identifier, kAdmin);
  applications.disable(frame.identifier, kAdmin);
  applications.enable(frame.identifier, kAdmin);
  applications.remove(frame.identifier, Actor("bob"));
  const std::string brief = frame.identifier.text().substr(0, 8);
  EXPECT_THAT(entries(), ElementsAre(HasSubstr("registered[Photo Frame " + brief),
                                     "Application changed[Frame 2 " + brief + "] by [admin]",
                                     "Secret renewed[Frame 2 " + brief + "] by [admin]",
                                     "Application disabled[Frame 2 " + brief + "] by [admin]",
                                     "Application enabled[Frame 2 " + brief + "] by [admin]",
                                     "Application removed[Frame 2 " + brief + "] by [bob]"));
}

TEST_F(ApplicationsTest, RemovingTakesCodesAndTokensAlong) {
  const Registered frame = add();
  const Registered other = add("Other");
  const Pair pair = login(frame.identifier);
  issue(frame.identifier);
  const Pair kept = login(other.identifier);
  const auto removed = grants().applications.remove(frame.identifier, kAdmin);
  ASSERT_TRUE(removed);
  EXPECT_EQ(removed->tokens, 1);
  EXPECT_EQ(removed->codes, 2);  // one of them spent
  EXPECT_FALSE(isGood(pair));
  EXPECT_TRUE(isGood(kept));
  EXPECT_FALSE(grants().applications.find(frame.identifier));
}

}  // namespace
}  // namespace grants_test
