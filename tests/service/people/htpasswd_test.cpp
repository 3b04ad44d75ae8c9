#include "service/people/htpasswd.h"

#include <crypt.h>
#include <sys/stat.h>
#include <unistd.h>

#include <set>
#include <string>
#include <utility>
#include <vector>

#include "service/people/password_hash.h"
#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::DirectoryTrouble;
using keldoauth::service::HtpasswdLine;
using keldoauth::service::HtpasswdUsers;
using keldoauth::service::PasswordCheck;
using keldoauth::service::readHtpasswd;
using keldoauth::service::Verdict;

constexpr char kBcrypt[] = "$2y$05$Qn4Vz19Q.Vz0MSMACqgGxu4T6FeIwv7c2ea5WmF34ZIp7/Nwc30xi";
constexpr char kSha256[] = "$5$saltsalt$0IyaXrmV7.sGNS6tirgqHLqX/G.FBvgkYA.lpPdS5sA";

/// What crypt is asked for, so that a test can see what a check costs.
std::vector<std::string>& settings() {
  static std::vector<std::string> asked;
  return asked;
}

}  // namespace

// The linker hands the product's calls of crypt_r to this (--wrap).
extern "C" char* __real_crypt_r(const char* phrase, const char* setting, crypt_data* data);
extern "C" char* __wrap_crypt_r(const char* phrase, const char* setting, crypt_data* data) {
  settings().emplace_back(setting);
  return __real_crypt_r(phrase, setting, data);
}

namespace {

class HtpasswdTest : public scene::Folder {
 protected:
  PasswordCheck check(const std::string& text, const std::string& user,
                      const std::string& password) const {
    write("users", text);
    return users().checkPassword(user, password);
  }
  [[nodiscard]] HtpasswdUsers users() const { return {at("users"), "a key"}; }

  std::string alice_ = std::string("alice:") + kSha256 + "\n";
  std::string bob_ = std::string("bob:") + kBcrypt + "\n";
};

TEST_F(HtpasswdTest, TheRightPasswordOfSomebodyWhoIsThereIsAYes) {
  const PasswordCheck result = check(alice_ + bob_, "bob", "secret");
  EXPECT_EQ(result.verdict, Verdict::kYes);
  EXPECT_EQ(result.user, "bob");
}

TEST_F(HtpasswdTest, AnotherPasswordIsANo) {
  for (const char* password : {"", "Secret", "secret ", "secre", "secret\n"}) {
    EXPECT_EQ(check(alice_ + bob_, "bob", password).verdict, Verdict::kNo) << password;
  }
}

TEST_F(HtpasswdTest, NamesAreTheFilesByteForByte) {
  for (const char* user : {"", "Alice", "alice ", "ali", "alice:", "alice\n", "#", "carol"}) {
    EXPECT_EQ(check(alice_, user, "secret").verdict, Verdict::kNo) << user;
  }
}

TEST_F(HtpasswdTest, TheHashItselfIsNoPassword) {
  EXPECT_EQ(check(alice_, "alice", kSha256).verdict, Verdict::kNo);
}

TEST_F(HtpasswdTest, ALineThatIsRefusedLetsNobodyIn) {
  EXPECT_EQ(check("alice:secret\n", "alice", "secret").verdict, Verdict::kNo);
  EXPECT_EQ(check("alice:\n", "alice", "").verdict, Verdict::kNo);
  EXPECT_EQ(check("alice\n", "alice", "").verdict, Verdict::kNo);
  EXPECT_EQ(check("alice:{SHA}5en6G6MezRroT3XKqkdPOmY/BfQ=\n", "alice", "secret").verdict,
            Verdict::kNo);
}

TEST_F(HtpasswdTest, OfTwoLinesWithOneNameTheFirstCounts) {
  EXPECT_EQ(check("alice:!\n" + alice_, "alice", "secret").verdict, Verdict::kNo);
  EXPECT_EQ(check(alice_ + "alice:!\n", "alice", "secret").verdict, Verdict::kYes);
}

TEST_F(HtpasswdTest, CommentsAndBlankLinesArePassedOver) {
  EXPECT_TRUE(readHtpasswd("# alice:x\n\n  \t\r\n").empty());
  EXPECT_TRUE(readHtpasswd("").empty());
}

TEST_F(HtpasswdTest, ALineWithoutAnEndCounts) {
  alice_.pop_back();
  EXPECT_EQ(check(alice_, "alice", "secret").verdict, Verdict::kYes);
}

TEST_F(HtpasswdTest, EveryBadLineHasItsNumberAndItsProblem) {
  const std::vector<HtpasswdLine> lines =
      readHtpasswd("# people\n" + alice_ + "bob\n:x\nal\x01:x\n" + alice_ + "carol:$apr1$a$b\n");
  ASSERT_EQ(lines.size(), 6U);
  const std::pair<std::size_t, const char*> expected[] = {
      {2, ""},
      {3, "has no colon"},
      {4, "has a name that cannot be used"},
      {5, "has a name that cannot be used"},
      {6, "repeats a name; the first counts"},
      {7, "the hash is Apache's MD5 ($apr1$), guessed too fast"}};
  for (std::size_t i = 0; i < lines.size(); ++i) {
    EXPECT_EQ(lines[i].number, expected[i].first);
    EXPECT_EQ(lines[i].problem, expected[i].second);
  }
}

TEST_F(HtpasswdTest, TheProblemIsThatOfTheFirstBadLine) {
  write("users", alice_ + "bob:{SHA}x\ncarol\n");
  EXPECT_EQ(users().problem(),
            at("users") + ", line 2: the hash is SHA-1 without a salt, guessed too fast");
  write("users", alice_);
  EXPECT_EQ(users().problem(), "");
}

TEST_F(HtpasswdTest, AFileThatCannotBeReadIsNoNo) {
  EXPECT_EQ(users().checkPassword("alice", "secret").verdict, Verdict::kCannotSay);
  EXPECT_THROW((void)users().stampOf("alice"), DirectoryTrouble);
  EXPECT_THAT(users().problem(), ::testing::HasSubstr("cannot read"));
  ASSERT_EQ(mkfifo(at("users").c_str(), 0600), 0);
  EXPECT_THAT(users().problem(), ::testing::HasSubstr("not a regular file"));
}

TEST_F(HtpasswdTest, AFileBeyondAllBoundsIsNotRead) {
  write("users", std::string((1U << 20U) + 1, '#'));
  EXPECT_THAT(users().problem(), ::testing::HasSubstr("longer than 1 MiB"));
}

TEST_F(HtpasswdTest, TheStampChangesWithTheHashAndEndsWithTheUser) {
  write("users", alice_);
  const auto before = users().stampOf("alice");
  EXPECT_EQ(before, kSha256);
  write("users", std::string("alice:") + kBcrypt + "\n");
  EXPECT_NE(users().stampOf("alice"), before);
  write("users", bob_);
  EXPECT_EQ(users().stampOf("alice"), std::nullopt);
}

TEST_F(HtpasswdTest, WhoIsNotThereCostsWhatSomebodyThereCosts) {
  settings().clear();
  check(alice_, "carol", "secret");
  check(bob_, "carol", "secret");
  check("", "carol", "secret");
  EXPECT_EQ(settings(),
            (std::vector<std::string>{kSha256, kBcrypt, keldoauth::service::kNobodysHash}));
}

TEST_F(HtpasswdTest, ANameThatIsNotThereAlwaysCostsTheSame) {
  std::set<std::string> costs;
  for (const std::string name : {"carol", "dave", "erin", "frank", "grace", "heidi", "ivan"}) {
    settings().clear();
    for (int i = 0; i < 3; ++i) check(alice_ + bob_, name, "secret" + std::to_string(i));
    ASSERT_EQ(settings().size(), 3U);
    EXPECT_EQ(std::set<std::string>(settings().begin(), settings().end()).size(), 1U) << name;
    costs.insert(settings()[0]);
  }
  EXPECT_EQ(costs.size(), 2U) << "all names cost alike: the mixture shows who is not there";
}

TEST_F(HtpasswdTest, WhoseLineIsRefusedCostsWhatSomebodyElseCosts) {
  settings().clear();
  check(alice_ + "bob:$apr1$a$b\n", "bob", "secret");
  EXPECT_EQ(settings(), std::vector<std::string>{kSha256});
}

TEST_F(HtpasswdTest, AHashThatCannotBeComputedTellsNobodyWhoIsThere) {
  const std::string text = "alice:$2y$99$broken\n";
  EXPECT_EQ(check(text, "alice", "secret").verdict, Verdict::kCannotSay);
  EXPECT_EQ(check(text, "carol", "secret").verdict, Verdict::kCannotSay);
}

}  // namespace
