#include "service/signing/key.h"

#include <cerrno>
#include <fstream>

#include "service/signing/base64url.h"
#include "service/text/encoding.h"
#include "tests/signing/calls.h"
#include "tests/signing/signing_test.h"
#include "tests/signing/vectors.h"
#include "tests/support/case_name.h"

namespace signing_test {
namespace {

using ::testing::HasSubstr;

class KeyTest : public SigningTest {
 protected:
  static std::string bytes(const std::string& text) { return fromBase64Url(text).value(); }
  static const Key& rsaKey() { return anySet().signingKey(Algorithm::kRs256, kStart); }
  static const Key& ecKey() { return anySet().signingKey(Algorithm::kEs256, kStart); }
};

TEST_F(KeyTest, SignsWithRsaAsTheStandardsExample) {
  const Key key = Key::read(vector("rfc7515-a2.jwk"));
  EXPECT_EQ(keldoauth::service::base64Url(key.sign(vectors::kRsaSigned)), vectors::kRsaSignature);
  EXPECT_TRUE(key.hasSigned(vectors::kRsaSigned, bytes(vectors::kRsaSignature)));
}

TEST_F(KeyTest, KnowsTheStandardsEcSignatureAndItsOwn) {
  const Key key = Key::read(vector("rfc7515-a3.jwk"));
  EXPECT_TRUE(key.hasSigned(vectors::kEcSigned, bytes(vectors::kEcSignature)));
  EXPECT_TRUE(key.hasSigned("text", key.sign("text")));
}

TEST_F(KeyTest, SignaturesHaveTheirFixedLengths) {
  for (int round = 0; round < 300; ++round) EXPECT_EQ(ecKey().sign("text").size(), 64U);
  for (int round = 0; round < 5; ++round) {
    EXPECT_EQ(rsaKey().sign(std::to_string(round)).size(), 256U);
  }
}

TEST_F(KeyTest, NoTwoEcSignaturesAreAlike) {
  EXPECT_NE(ecKey().sign("text"), ecKey().sign("text"));
}

TEST_F(KeyTest, AnyChangedBitIsSeen) {
  for (const Key* key : {&rsaKey(), &ecKey()}) {
    const std::string signature = key->sign("text");
    EXPECT_FALSE(key->hasSigned("tex", signature));
    for (std::size_t i = 0; i < signature.size(); i += 7) {
      std::string changed = signature;
      changed[i] = static_cast<char>(changed[i] ^ 1);
      EXPECT_FALSE(key->hasSigned("text", changed)) << i;
    }
  }
}

TEST_F(KeyTest, SignaturesOfOtherLengthsAreNone) {
  for (const Key* key : {&rsaKey(), &ecKey()}) {
    const std::string signature = key->sign("text");
    EXPECT_FALSE(key->hasSigned("text", ""));
    EXPECT_FALSE(key->hasSigned("text", signature.substr(1)));
    EXPECT_FALSE(key->hasSigned("text", std::string(1, '\0') + signature));
    EXPECT_FALSE(key->hasSigned("text", signature + '\0'));
  }
}

TEST_F(KeyTest, NumbersOutsideTheirRangeAreNoSignature) {
  for (const char filler : {'\0', '\xff'}) {
    EXPECT_FALSE(rsaKey().hasSigned("text", std::string(256, filler)));
    EXPECT_FALSE(ecKey().hasSigned("text", std::string(64, filler)));
  }
}

TEST_F(KeyTest, ThumbprintIsThatOfTheStandard) {
  EXPECT_EQ(Key::read(vector("rfc7517-a2-rsa.jwk")).identifier(), vectors::kRsaThumbprint);
}

TEST_F(KeyTest, ReadsWhatItWrites) {
  for (const char* name :
       {"rfc7515-a2.jwk", "rfc7515-a3.jwk", "rfc7517-a2-rsa.jwk", "rfc7517-a2-ec.jwk"}) {
    Json::Value jwk = vector(name);
    const Key key = Key::read(jwk);
    jwk["use"] = "sig";
    jwk["kid"] = key.identifier();
    EXPECT_EQ(key.privateJwk(), jwk) << name;
  }
  for (const DatedKey& dated : anySet().keys()) {
    EXPECT_EQ(Key::read(dated.key.privateJwk()).identifier(), dated.key.identifier());
  }
}

TEST_F(KeyTest, PublicJwkHasNoSecret) {
  for (const DatedKey& dated : anySet().keys()) {
    const Json::Value jwk = dated.key.publicJwk();
    for (const char* secret : {"d", "p", "q", "dp", "dq", "qi"}) {
      EXPECT_FALSE(jwk.isMember(secret)) << secret;
    }
  }
}

TEST_F(KeyTest, FreshKeysDiffer) {
  EXPECT_NE(Key::make(Algorithm::kEs256).identifier(), Key::make(Algorithm::kEs256).identifier());
}

TEST_F(KeyTest, WithoutRandomNumbersNothingIsMadeOrSigned) {
  const Key& rsa = rsaKey();
  const Key& ec = ecKey();
  Calls::fail("getentropy", ENOSYS);
  for (const auto& body : std::vector<std::function<void()>>{
           [] { Key::make(Algorithm::kRs256); }, [] { Key::make(Algorithm::kEs256); },
           [&] { static_cast<void>(rsa.sign("text")); },
           [&] { static_cast<void>(ec.sign("text")); }}) {
    EXPECT_EQ(failureOf(body), "no random numbers: Function not implemented");
  }
}

/// A member of a good key set to something else.
struct BadMember {
  const char* name;
  const char* file;
  const char* member;
  Json::Value value;
  const char* failure;
};

void PrintTo(const BadMember& row, std::ostream* out) {
  *out << row.name;
}

class BadMemberTest : public KeyTest, public ::testing::WithParamInterface<BadMember> {};

TEST_P(BadMemberTest, IsNamed) {
  Json::Value jwk = vector(GetParam().file);
  jwk[GetParam().member] = GetParam().value;
  EXPECT_EQ(failureOf([&] { Key::read(jwk); }), GetParam().failure);
}

constexpr char kRsa[] = "rfc7515-a2.jwk";
constexpr char kEc[] = "rfc7515-a3.jwk";
// The generator of the curve, and a half of it.
constexpr char kOtherX[] = "axfR8uEsQkf4vOblY6RA8ncDfYEt6zOg9KE5RdiYwpY";
constexpr char kOtherY[] = "T-NC4v4af5uO5-tKfA-eFivOM1drMV7Oy7ZAaDe_UfU";
constexpr char kOrder[] = "_____wAAAAD__________7zm-q2nF56E87nKwvxjJVE";
const std::string kLong(400, 'A');

const BadMember kBadMembers[] = {
    {"UnknownAlgorithm", kRsa, "alg", "HS256", "alg is neither RS256 nor ES256"},
    {"NoAlgorithm", kRsa, "alg", Json::nullValue, "alg is no text"},
    {"AlgorithmOfTheOther", kRsa, "alg", "ES256", "kty is not EC"},
    {"TheOthersAlgorithm", kEc, "alg", "RS256", "kty is not RSA"},
    {"TypeNoText", kRsa, "kty", 1, "kty is no text"},
    {"NumberForAText", kRsa, "n", 65537, "n is no text"},
    {"NoBase64Url", kRsa, "d", "a+b/", "d is no base64url"},
    {"Padding", kRsa, "e", "AQAB=", "e is no base64url"},
    {"Empty", kRsa, "q", "", "q has a bad length"},
    {"TooLong", kRsa, "n", std::string(684, 'A'), "n has a bad length"},
    {"ZeroInFront", kRsa, "e", "AAEAAQ", "e has a zero in front"},
    {"Zero", kRsa, "p", "AA", "p has a zero in front"},
    {"ShortModulus", kRsa, "n", "Aw", "n is too short"},
    {"ShortPrime", kRsa, "p", "Aw", "p and q differ in length"},
    {"Exponent3", kRsa, "e", "Aw", "e is not 65537"},
    {"PrivateExponentOfAnother", kRsa, "d", "Aw", "dp does not fit"},
    {"FirstExponentOfAnother", kRsa, "dp", "Aw", "dp does not fit"},
    {"SecondExponentOfAnother", kRsa, "dq", "Aw", "dq does not fit"},
    {"CoefficientOfAnother", kRsa, "qi", "Aw", "qi does not fit"},
    {"OtherCurve", kEc, "crv", "P-384", "crv is not P-256"},
    {"NoCurve", kEc, "crv", Json::nullValue, "crv is no text"},
    {"ShortX", kEc, "x", "AQAB", "x has a bad length"},
    {"LongY", kEc, "y", std::string(44, 'A'), "y has a bad length"},
    {"NoPoint", kEc, "x", kOtherX, "x and y are no point of the curve"},
    {"PrivateZero", kEc, "d", std::string(43, 'A'), "d is no number of the curve"},
    {"PrivateTooLarge", kEc, "d", kOrder, "d is no number of the curve"},
};
INSTANTIATE_TEST_SUITE_P(Key, BadMemberTest, ::testing::ValuesIn(kBadMembers), support::CaseName());

TEST_F(KeyTest, PublicPointOfAnotherKeyIsRefused) {
  Json::Value jwk = vector(kEc);
  jwk["x"] = kOtherX;
  jwk["y"] = kOtherY;
  EXPECT_EQ(failureOf([&] { Key::read(jwk); }), "x and y do not fit d");
}

TEST_F(KeyTest, FactorsOfAnotherModulusAreRefused) {
  Json::Value jwk = vector(kRsa);
  jwk["n"] = vector("rfc7517-a2-rsa.jwk")["n"];
  EXPECT_EQ(failureOf([&] { Key::read(jwk); }), "n is not p times q");
}

TEST_F(KeyTest, EvenFactorsAreRefused) {
  Json::Value jwk = vector(kRsa);
  std::string even = bytes(jwk["p"].asString());
  even.back() = static_cast<char>(even.back() & ~1);
  jwk["p"] = keldoauth::service::base64Url(even);
  EXPECT_EQ(failureOf([&] { Key::read(jwk); }), "p and q are no primes");
}

TEST_F(KeyTest, FailureTellsNothingOfTheKey) {
  Json::Value jwk = vector(kRsa);
  const std::string secret = jwk["d"].asString();
  jwk["d"] = secret + "!";
  EXPECT_THAT(failureOf([&] { Key::read(jwk); }), ::testing::Not(HasSubstr(secret.substr(0, 8))));
}

}  // namespace
}  // namespace signing_test
