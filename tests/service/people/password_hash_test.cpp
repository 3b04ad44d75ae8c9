#include "service/people/password_hash.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using keldoauth::service::hashLike;
using keldoauth::service::kNobodysHash;
using keldoauth::service::newHash;
using keldoauth::service::problemWithHash;

/// Of "secret", made by other programs: htpasswd(1) and openssl-passwd(1).
constexpr const char* kForeign[] = {
    "$2y$05$Qn4Vz19Q.Vz0MSMACqgGxu4T6FeIwv7c2ea5WmF34ZIp7/Nwc30xi",
    "$5$saltsalt$0IyaXrmV7.sGNS6tirgqHLqX/G.FBvgkYA.lpPdS5sA",
    "$6$saltsalt$"
    "TVLlQcbpFVof5W3Yz4DTP6gRstiNuHwwTt6GLc1E5n0U0aDehy0S5knV8wiOQSpT0Y77vwPZN.Pq.H91p5hVO1"};

TEST(PasswordHashTest, HashesOfOtherProgramsAreTaken) {
  for (const char* hash : kForeign) {
    EXPECT_EQ(problemWithHash(hash), "") << hash;
    EXPECT_EQ(hashLike("secret", hash), hash);
    EXPECT_NE(hashLike("secret ", hash), hash);
  }
}

TEST(PasswordHashTest, ANewHashIsYescryptWithASaltOfItsOwn) {
  const auto one = newHash("secret");
  const auto two = newHash("secret");
  ASSERT_TRUE(one && two);
  EXPECT_EQ(one->substr(0, 3), "$y$");
  EXPECT_NE(*one, *two);
  EXPECT_EQ(problemWithHash(*one), "");
  EXPECT_EQ(hashLike("secret", *one), *one);
  EXPECT_NE(hashLike("Secret", *one), *one);
}

TEST(PasswordHashTest, NobodysHashCostsWhatANewOneDoes) {
  const auto hash = newHash("x");
  ASSERT_TRUE(hash);
  const std::string setting = std::string(kNobodysHash).substr(0, 7);
  EXPECT_EQ(hash->substr(0, 7), setting);
  EXPECT_EQ(hashLike("nobody", kNobodysHash), std::string(kNobodysHash));
}

TEST(PasswordHashTest, WhatIsRefusedIsNamed) {
  const std::pair<const char*, const char*> table[] = {
      {"", "is empty"},
      {"!", "is locked"},
      {"*", "is locked"},
      {"!$y$j9T$salt$hash", "is locked"},
      {"$apr1$r31.....$HqJZimcKQFAMYayBlzkrA/", "is Apache's MD5 ($apr1$), guessed too fast"},
      {"{SHA}2PRZAyDhNDqRW2OUFwZQqPNdaSY=", "is SHA-1 without a salt, guessed too fast"},
      {"{SSHA}xx", "is one round of SHA-1, guessed too fast"},
      {"$1$salt$qJH7.N4xYta3aEG/dfqo/0", "is a hash that is guessed too fast"},
      {"secret", "is no hash that is known here (a password in clear?)"},
      {"rqXexS6ZhobKA", "is no hash that is known here (a password in clear?)"},
      {"$9$x", "is no hash that is known here (a password in clear?)"},
      {"$6$salt$hash:more", "has characters that no hash has"},
      {"$6$salt$hash\r", "has characters that no hash has"},
      {"$6$salt$h\xC3\xA9", "has characters that no hash has"}};
  for (const auto& [hash, problem] : table) EXPECT_EQ(problemWithHash(hash), problem) << hash;
}

TEST(PasswordHashTest, ASettingThatCryptRefusesHasNoHash) {
  for (const char* setting : {"", "*0", "$y$", "$2y$99$x", "$5$rounds=1$a"}) {
    EXPECT_EQ(hashLike("secret", setting), std::nullopt) << setting;
  }
}

}  // namespace
