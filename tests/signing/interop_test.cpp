// What we sign is checked, and what others sign is read, by software that knows
// nothing of ours: Python's cryptography, over OpenSSL.

#include <cstdlib>
#include <sstream>

#include "tests/signing/signing_test.h"

namespace signing_test {
namespace {

class InteropTest : public SigningTest {
 protected:
  static std::string runCheck(const std::string& arguments) {
    const std::string command = "env -u LD_LIBRARY_PATH /usr/bin/python3 " SIGNING_CHECK " " +
                                arguments + " > /tmp/keys/said 2>&1";
    const int status = std::system(command.c_str());
    return std::to_string(status) + " " + readFile("/tmp/keys/said");
  }
};

TEST_F(InteropTest, OthersAcceptWhatWeSign) {
  writeFile("/tmp/keys/set", written(anySet().publicSet(kStart)));
  std::string tokens;
  Json::Value claims(Json::objectValue);
  for (int i = 0; i < 20; ++i) {
    claims["sub"] = "user " + std::to_string(i);
    for (const Algorithm algorithm : kAlgorithms) {
      tokens += signedToken(claims, anySet().signingKey(algorithm, kStart)) + "\n";
    }
  }
  writeFile("/tmp/keys/tokens", tokens);
  EXPECT_EQ(runCheck("verify /tmp/keys/set /tmp/keys/tokens"), "0 40 good\n");
}

TEST_F(InteropTest, WeReadTheKeysOfOthersAndAcceptWhatTheySign) {
  EXPECT_EQ(runCheck("make /tmp/keys/set /tmp/keys/tokens"), "0 made\n");
  const KeySet set = KeySet::read(readFile("/tmp/keys/set"));
  std::istringstream tokens(readFile("/tmp/keys/tokens"));
  int good = 0;
  for (std::string token; std::getline(tokens, token);) {
    const std::optional<Json::Value> claims = claimsOf(token, set);
    ASSERT_TRUE(claims) << token;
    EXPECT_EQ((*claims)["sub"], "somebody");
    ++good;
  }
  EXPECT_EQ(good, 4);
}

}  // namespace
}  // namespace signing_test
