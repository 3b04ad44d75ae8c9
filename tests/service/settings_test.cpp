#include "service/settings/settings.h"

#include <sys/stat.h>

#include "service/settings/kept_settings.h"
#include "service/settings/keys.h"
#include "tests/support/world.h"

using ::testing::ElementsAre;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;
using ::testing::SizeIs;

namespace {

using namespace keldoauth::service;
using Faults = std::vector<std::string>;

constexpr char kPath[] = "/tmp/service.json";
constexpr char kKeysPath[] = "/tmp/service.keys.json";

/// An issuer and whatever else.
std::string withIssuer(const std::string& more) {
  return R"({"issuer": "https://box.example", )" + more + "}";
}

Settings parsed(const std::string& text) {
  return parseSettings(text, kPath);
}

Faults faultsOf(const std::string& text) {
  try {
    parsed(text);
  } catch (const SettingsFault& fault) {
    return fault.faults();
  }
  return {};
}

/// The one fault that `member` makes.
std::string faultOf(const std::string& member) {
  const Faults faults = faultsOf(withIssuer(member));
  EXPECT_THAT(faults, SizeIs(1)) << member;
  return faults.empty() ? "" : faults.front();
}

// What is taken -------------------------------------------------------------------

TEST(SettingsTest, NeedNothingButAnIssuer) {
  const Settings settings = parsed(R"({"issuer": "https://box.example"})");
  EXPECT_EQ(settings.issuer, "https://box.example");
  EXPECT_EQ(settings.basePath, "");
  EXPECT_THAT(settings.administrators, IsEmpty());
  EXPECT_EQ(settings.initialAccessToken, "");
  EXPECT_EQ(settings.signIn, SignIn::kWebServer);
  EXPECT_EQ(settings.sessionSeconds, 12 * 3600);
  EXPECT_EQ(settings.keysFile, kKeysPath);
  EXPECT_EQ(settings.signingKeysFile, "/tmp/signing.keys.json");
  EXPECT_EQ(settings.scopes.known("profile files.read"), "profile");
}

TEST(SettingsTest, TakeEveryKey) {
  const Settings settings = parsed(R"({
    // what an owner would want to remember
    "issuer": "https://box.example:8443/auth",
    "administrators": ["admin", "o'neil", "zoë"],
    "scopes": {"music": "Hear your music", "music.write": "Change your “music”"},
    "initial_access_token": "0123456789abcdef0123456789ABCDEF",
    "sign_in": "htpasswd",
    "htpasswd_file": "/etc/keldoauth/people",
    "session_hours": 8760,
    "keys_file": "/etc/keldoauth/keys",
    "counters_file": "/run/box/counters",
    "signing_keys_file": "/etc/keldoauth/signing"
  })");
  EXPECT_EQ(settings.issuer, "https://box.example:8443/auth");
  EXPECT_EQ(settings.basePath, "/auth");
  EXPECT_THAT(settings.administrators, ElementsAre("admin", "o'neil", "zoë"));
  EXPECT_EQ(settings.scopes.inWords("music.write"), "Change your “music”");
  EXPECT_EQ(settings.signingKeysFile, "/etc/keldoauth/signing");
  EXPECT_EQ(settings.initialAccessToken, "0123456789abcdef0123456789ABCDEF");
  EXPECT_EQ(settings.signIn, SignIn::kHtpasswd);
  EXPECT_EQ(settings.htpasswdFile, "/etc/keldoauth/people");
  EXPECT_EQ(settings.sessionSeconds, 8760LL * 3600);
  EXPECT_EQ(settings.keysFile, "/etc/keldoauth/keys");
  EXPECT_EQ(settings.countersFile, "/run/box/counters");
}

TEST(SettingsTest, MakeAddressesBelowTheIssuersPath) {
  const Settings settings = parsed(R"({"issuer": "http://127.0.0.1:8480/auth"})");
  EXPECT_EQ(settings.endpoint("/oauth/token"), "http://127.0.0.1:8480/auth/oauth/token");
  EXPECT_EQ(settings.link("/admin"), "/auth/admin");
}

TEST(SettingsTest, TakeTheUsersOfTheSystem) {
  EXPECT_EQ(parsed(withIssuer(R"("sign_in": "system")")).signIn, SignIn::kSystem);
  EXPECT_EQ(parsed(withIssuer(R"("sign_in": "web-server")")).signIn, SignIn::kWebServer);
}

TEST(SettingsTest, CountFailuresUnlessToldNotTo) {
  EXPECT_EQ(parsed(withIssuer(R"("sign_in": "system")")).countersFile,
            "/var/lib/keldoauth/counters");
  EXPECT_EQ(parsed(withIssuer(R"("counters_file": "")")).countersFile, "");
}

// What is refused -----------------------------------------------------------------

TEST(SettingsTest, RefuseWhatIsNoJsonObject) {
  for (const char* text : {"", "{", "[]", "null", "\"issuer\"", "{\"issuer\": 'x'}", "{} {}",
                           R"({"issuer": "https://a", "issuer": "https://b"})"}) {
    const Faults faults = faultsOf(text);
    ASSERT_THAT(faults, SizeIs(1)) << text;
    EXPECT_THAT(faults[0], HasSubstr("/tmp/service.json: is no")) << text;
  }
}

TEST(SettingsTest, SayWhereTheJsonEndsAndQuoteNothing) {
  const Faults faults = faultsOf("{\n  \"initial_access_token\": s3cret\n}");
  ASSERT_THAT(faults, SizeIs(1));
  EXPECT_THAT(faults[0], HasSubstr("Line 2, Column"));
  EXPECT_THAT(faults[0], Not(HasSubstr("s3cret")));
}

TEST(SettingsTest, RefuseDeepNests) {
  EXPECT_THAT(faultsOf(std::string(10000, '[')), SizeIs(1));
}

TEST(SettingsTest, NameAnUnknownKey) {
  EXPECT_THAT(faultOf(R"("adminstrators": [])"), EndsWith("unknown key: adminstrators"));
  EXPECT_THAT(faultOf(R"("a b\n": [])"), EndsWith("unknown key"));
}

TEST(SettingsTest, MissTheIssuer) {
  EXPECT_THAT(faultsOf("{}"), ElementsAre("/tmp/service.json: issuer is missing"));
}

TEST(SettingsTest, NameAllFaultsAtOnce) {
  EXPECT_THAT(faultsOf(R"({"session_hours": "x", "scopes": 1, "more": 2})"), SizeIs(4));
}

TEST(SettingsTest, RefuseIssuersThatAreNone) {
  for (const char* issuer : {"null",
                             "1",
                             R"("")",
                             R"("box.example")",
                             R"("https://")",
                             R"("https://box.example/")",
                             R"("HTTPS://box.example")",
                             R"("https://Box.example")",
                             R"("https://box.example?x")",
                             R"("https://box.example/#f")",
                             R"("https://u@box.example")",
                             R"("https://box.example:")",
                             R"("https://box.example:123456")",
                             R"("https://box.example//a")",
                             R"("https://box.example/a/../b")",
                             R"("https://box.example/a b")",
                             R"("ftp://box.example")",
                             R"("https://box.example/%41")",
                             R"("https://box.example/\"")",
                             R"("https://[::1")"}) {
    const Faults faults = faultsOf(std::string(R"({"issuer": )") + issuer + "}");
    ASSERT_THAT(faults, SizeIs(1)) << issuer;
    EXPECT_THAT(faults[0], HasSubstr("issuer must be")) << issuer;
  }
}

TEST(SettingsTest, AllowHttpOnLoopbackAlone) {
  for (const char* host : {"127.0.0.1", "localhost:8480", "[::1]:80"}) {
    EXPECT_THAT(faultsOf(std::string(R"({"issuer": "http://)") + host + "\"}"), IsEmpty()) << host;
  }
  for (const char* host :
       {"box.example", "127.0.0.1.example", "localhost.example", "192.168.1.2"}) {
    const Faults faults = faultsOf(std::string(R"({"issuer": "http://)") + host + "\"}");
    ASSERT_THAT(faults, SizeIs(1)) << host;
    EXPECT_THAT(faults[0], HasSubstr("https://")) << host;
  }
}

TEST(SettingsTest, RefuseValuesOfOtherKinds) {
  const std::pair<const char*, Faults> kCases[] = {
      {"administrators", {"\"admin\"", "{}", "[1]", "[\"\"]", "[\"a\\nb\"]", "null"}},
      {"scopes", {"[]", "{}", "{\"a b\": \"x\"}", "{\"a\": 1}", "{\"a\": \"\"}", "{\"\": \"x\"}"}},
      {"initial_access_token", {"1", "null", "\"short\"", "[]"}},
      {"sign_in", {"\"pam\"", "1", "\"\"", "null"}},
      {"session_hours", {"0", "-1", "8761", "1.5", "\"12\"", "9999999999"}},
      {"keys_file", {"\"\"", "\"keys\"", "1", "\"/a\\u0000b\""}},
      {"counters_file", {"\"counters\"", "1", "null", "\"/a\\u0000b\""}},
      {"htpasswd_file", {"\"people\"", "null"}}};
  for (const auto& [key, values] : kCases) {
    for (const std::string& value : values) {
      const std::string fault = faultOf("\"" + std::string(key) + "\": " + value);
      EXPECT_THAT(fault, HasSubstr(std::string("service.json: ") + key)) << value;
    }
  }
}

TEST(SettingsTest, WantTheFileOfHtpasswd) {
  EXPECT_THAT(faultOf(R"("sign_in": "htpasswd")"), HasSubstr("htpasswd_file is missing"));
}

// Files ---------------------------------------------------------------------------

class SettingsFileTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    unlink(kKeysPath);
    write(kPath, R"({"issuer": "https://box.example"})");
  }
  void TearDown() override {
    unlink(kPath);
    unlink(kKeysPath);
    World::TearDown();
  }

  static void write(const char* path, const std::string& text, mode_t mode = 0600) {
    writeFile(path, text);
    chmod(path, mode);
  }
  static std::string faultOfFiles() {
    try {
      readSettings(kPath);
    } catch (const SettingsFault& fault) {
      return fault.what();
    }
    return "none";
  }
  static mode_t modeOf(const char* path) {
    struct stat status {};
    return stat(path, &status) == 0 ? status.st_mode & 07777U : 0U;
  }
};

TEST_F(SettingsFileTest, ReadBackTheKeysThatWereMade) {
  makeKeys(kKeysPath);
  const Settings settings = readSettings(kPath);
  EXPECT_THAT(settings.formKey, SizeIs(64));
  EXPECT_THAT(settings.sessionKey, SizeIs(64));
  EXPECT_NE(settings.formKey, settings.sessionKey);
}

TEST_F(SettingsFileTest, MakeKeysForTheirOwnerAlone) {
  const mode_t before = umask(0);
  makeKeys(kKeysPath);
  umask(before);
  EXPECT_EQ(modeOf(kKeysPath), 0600U);
}

TEST_F(SettingsFileTest, NeverMakeKeysInPlaceOfOthers) {
  makeKeys(kKeysPath);
  const std::string first = readFile(kKeysPath);
  EXPECT_THROW(makeKeys(kKeysPath), SettingsFault);
  EXPECT_EQ(readFile(kKeysPath), first);
  EXPECT_THROW(makeKeys("/tmp/nowhere/keys"), SettingsFault);
}

TEST_F(SettingsFileTest, LeaveNothingBesideTheKeys) {
  const auto drafts = [] { return std::system("ls /tmp/service.keys.json.* >/dev/null 2>&1"); };
  makeKeys(kKeysPath);
  EXPECT_THROW(makeKeys(kKeysPath), SettingsFault);
  EXPECT_NE(drafts(), 0);
}

TEST_F(SettingsFileTest, AreMissed) {
  EXPECT_EQ(faultOfFiles(), "/tmp/service.keys.json: No such file or directory");
  unlink(kPath);
  EXPECT_EQ(faultOfFiles(), "/tmp/service.json: No such file or directory");
}

TEST_F(SettingsFileTest, RefuseShortMissingAndUnknownKeys) {
  const std::string good = std::string(R"("form_key": ")") + std::string(32, 'f') + "\"";
  write(kKeysPath, "{" + good + R"(, "session_key": "short"})");
  EXPECT_THAT(faultOfFiles(), HasSubstr("session_key must be a text of at least 32 characters"));
  write(kKeysPath, "{" + good + "}");
  EXPECT_THAT(faultOfFiles(), HasSubstr("session_key"));
  write(kKeysPath, R"({"form_key": 1, "session_key": 2})");
  EXPECT_THAT(faultOfFiles(), HasSubstr("form_key"));
  write(kKeysPath, "{" + good + R"(, "session_key": ")" + std::string(32, 's') + R"(", "x": 1})");
  EXPECT_THAT(faultOfFiles(), HasSubstr("unknown key"));
}

TEST_F(SettingsFileTest, RefuseSecretsThatEverybodyCanRead) {
  makeKeys(kKeysPath);
  chmod(kKeysPath, 0640);
  EXPECT_EQ(faultOfFiles(), "none");
  chmod(kKeysPath, 0644);
  EXPECT_EQ(faultOfFiles(), "/tmp/service.keys.json: everybody can read it");
  chmod(kKeysPath, 0600);
  chmod(kPath, 0644);
  EXPECT_EQ(faultOfFiles(), "none");
  write(kPath, withIssuer(R"("initial_access_token": "0123456789abcdef0123456789abcdef")"), 0644);
  EXPECT_THAT(faultOfFiles(), HasSubstr("everybody can read it, and with it initial_access_token"));
}

TEST_F(SettingsFileTest, RefuseWhatEverybodyCanWriteTo) {
  makeKeys(kKeysPath);
  chmod(kKeysPath, 0602);
  EXPECT_EQ(faultOfFiles(), "/tmp/service.keys.json: everybody can write to it");
  chmod(kKeysPath, 0600);
  chmod(kPath, 0666);
  EXPECT_THAT(faultOfFiles(), HasSubstr("everybody can write to it"));
}

TEST_F(SettingsFileTest, RefuseWhatIsNoFileOrTooLong) {
  makeKeys(kKeysPath);
  unlink(kPath);
  ASSERT_EQ(mkfifo(kPath, 0600), 0);
  EXPECT_THAT(faultOfFiles(), EndsWith("is no regular file"));
  unlink(kPath);
  write(kPath, std::string(300 * 1024, ' '));
  EXPECT_THAT(faultOfFiles(), EndsWith("is too long"));
}

// Kept ----------------------------------------------------------------------------

TEST_F(SettingsFileTest, AreReadOnceWhileNobodyChangesThem) {
  makeKeys(kKeysPath);
  KeptSettings kept(kPath);
  const Settings* const first = &kept.current();
  const std::string* const scopes = &first->scopes.begin()->name;
  EXPECT_EQ(&kept.current().scopes.begin()->name, scopes);
}

TEST_F(SettingsFileTest, AreReadAgainWhenTheyHaveChanged) {
  makeKeys(kKeysPath);
  KeptSettings kept(kPath);
  const std::string formKey = kept.current().formKey;
  write(kPath, R"({"issuer": "https://other.example"})");
  EXPECT_EQ(kept.current().issuer, "https://other.example");
  unlink(kKeysPath);
  makeKeys(kKeysPath);
  EXPECT_NE(kept.current().formKey, formKey);
}

TEST_F(SettingsFileTest, AreNotGoodAnyMoreOnceTheyAreBroken) {
  makeKeys(kKeysPath);
  KeptSettings kept(kPath);
  kept.current();
  write(kPath, "{");
  EXPECT_THROW(kept.current(), SettingsFault);
  EXPECT_THROW(kept.current(), SettingsFault);
  write(kPath, R"({"issuer": "https://box.example"})");
  EXPECT_EQ(kept.current().issuer, "https://box.example");
}

}  // namespace
