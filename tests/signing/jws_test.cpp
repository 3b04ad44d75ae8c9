#include "service/signing/jws.h"

#include "service/signing/base64url.h"
#include "service/text/encoding.h"
#include "tests/signing/signing_test.h"

namespace signing_test {
namespace {

class JwsTest : public SigningTest {
 protected:
  static const Key& key(Algorithm algorithm) { return anySet().signingKey(algorithm, kStart); }

  static Json::Value claims() {
    Json::Value members(Json::objectValue);
    members["iss"] = "https://box.example";
    members["sub"] = "J\xc3\xbcrgen \"the\" <user>";
    members["iat"] = Json::Int64(1) << 33U;
    return members;
  }
  static std::string token(Algorithm algorithm = Algorithm::kEs256) {
    return signedToken(claims(), key(algorithm));
  }

  /// A token with a good signature over any header and payload.
  static std::string forged(const std::string& header, const std::string& payload) {
    const std::string text =
        keldoauth::service::base64Url(header) + '.' + keldoauth::service::base64Url(payload);
    return text + '.' + keldoauth::service::base64Url(key(Algorithm::kEs256).sign(text));
  }
  static std::string header(const std::string& more = "") {
    return R"({"alg":"ES256","kid":")" + key(Algorithm::kEs256).identifier() + '"' + more + '}';
  }
};

TEST_F(JwsTest, ClaimsComeBackAsTheyWere) {
  for (const Algorithm algorithm : kAlgorithms) {
    EXPECT_EQ(claimsOf(token(algorithm), anySet()), claims());
  }
}

TEST_F(JwsTest, HeaderNamesAlgorithmKeyAndType) {
  for (const Algorithm algorithm : kAlgorithms) {
    const std::string text = token(algorithm);
    Json::Value expected(Json::objectValue);
    expected["alg"] = std::string(nameOf(algorithm));
    expected["kid"] = key(algorithm).identifier();
    expected["typ"] = "JWT";
    EXPECT_EQ(parsed(fromBase64Url(text.substr(0, text.find('.'))).value()), expected);
  }
}

TEST_F(JwsTest, KeyInAnyStateIsKnown) {
  KeySet set = anySet();
  set.rotate(kStart);
  EXPECT_TRUE(claimsOf(token(), set));
  EXPECT_TRUE(claimsOf(signedToken(claims(), set.keys().back().key), set));
}

TEST_F(JwsTest, TokenOfAnotherServiceIsUnknown) {
  const KeySet other = KeySet::make(kStart);
  EXPECT_EQ(claimsOf(token(), other), std::nullopt);
}

TEST_F(JwsTest, ChangedTokenIsUnknown) {
  const std::string text = token();
  for (std::size_t i = 0; i < text.size(); i += 3) {
    std::string changed = text;
    changed[i] = changed[i] == 'A' ? 'B' : 'A';
    EXPECT_EQ(claimsOf(changed, anySet()), std::nullopt) << i;
  }
}

TEST_F(JwsTest, OtherFormsAreUnknown) {
  const std::string text = token();
  const std::string unsignedText = text.substr(0, text.rfind('.') + 1);
  for (const std::string& other :
       {std::string(), std::string("."), std::string(".."), std::string("..."), unsignedText,
        unsignedText.substr(0, unsignedText.size() - 1), text + '.', '.' + text, text + '=',
        text + "\n", text + ".AA", "{\"payload\":\"\"}" + std::string()}) {
    EXPECT_EQ(claimsOf(other, anySet()), std::nullopt) << other;
  }
  EXPECT_EQ(claimsOf(text + std::string(kMaxToken, 'A'), anySet()), std::nullopt);
}

TEST_F(JwsTest, ForgedOnesOfTheRightFormAreKnown) {
  EXPECT_EQ(claimsOf(forged(header(), written(claims())), anySet()), claims());
}

TEST_F(JwsTest, HeaderCannotChooseTheAlgorithm) {
  const std::string kid = key(Algorithm::kEs256).identifier();
  for (const char* algorithm : {"none", "RS256", "HS256", "es256", ""}) {
    const std::string text = R"({"alg":")" + std::string(algorithm) + R"(","kid":")" + kid + "\"}";
    EXPECT_EQ(claimsOf(forged(text, "{}"), anySet()), std::nullopt) << algorithm;
  }
}

TEST_F(JwsTest, HeaderThatCannotBeFollowedIsRefused) {
  for (const std::string& text :
       {header(R"(,"crit":["b64"],"b64":false)"), header(",\"alg\":\"ES256\""), header() + " x",
        std::string(R"({"alg":"ES256"})"), std::string(R"({"alg":"ES256","kid":1})"),
        std::string(R"({"alg":7,"kid":")" + key(Algorithm::kEs256).identifier() + "\"}"),
        std::string("[]"), std::string()}) {
    EXPECT_EQ(claimsOf(forged(text, "{}"), anySet()), std::nullopt) << text;
  }
}

TEST_F(JwsTest, PayloadThatIsNoObjectIsRefused) {
  for (const char* payload : {"", "[]", "1", "{\"a\":1,\"a\":2}", "text"}) {
    EXPECT_EQ(claimsOf(forged(header(), payload), anySet()), std::nullopt) << payload;
  }
}

}  // namespace
}  // namespace signing_test
