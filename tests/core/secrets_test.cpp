#include <algorithm>

#include "tests/core/core_test.h"

namespace {

using namespace KELDOAUTHSERVER;
using namespace core_tests;
using support::Platform;
using support::SystemLog;
using ::testing::ElementsAre;
using ::testing::IsEmpty;

class SecretsTest : public CoreTest {
 protected:
  Json::Value both = json("{'client_secret': 'def', 'client_id': 'abc', 'scope': 'read'}");
  Json::Value bothEncrypted =
      json("{'client_secret': '<def>', 'client_id': '<abc>', 'scope': 'read'}");
};

// Conversion ------------------------------------------------------------------

TEST_F(SecretsTest, TheTwoMembersAreEncryptedInPlace) {
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(both), 1);
  EXPECT_EQ(both, bothEncrypted);
}

TEST_F(SecretsTest, TheTwoMembersAreDecryptedInPlace) {
  EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(bothEncrypted), 1);
  EXPECT_EQ(bothEncrypted, both);
}

TEST_F(SecretsTest, EitherMemberMayBeMissing) {
  Json::Value doc = json("{'client_secret': 'def'}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_secret': '<def>'}"));
  EXPECT_THAT(Platform::encrypted(), ElementsAre("def"));
}

TEST_F(SecretsTest, DocumentWithoutThemPassesUnchanged) {
  for (const char* text : {"{}", "null", "{'code': 'x', 'Client_id': 'y', 'client_id2': 'z'}",
                           "{'condition': {'client_id': 'abc'}}"}) {
    Json::Value doc = json(text);
    EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1) << text;
    EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(doc), 1) << text;
    EXPECT_EQ(doc, json(text));
  }
  EXPECT_THAT(Platform::encrypted(), IsEmpty());
  EXPECT_THAT(Platform::decrypted(), IsEmpty());
}

TEST_F(SecretsTest, EmptyTextIsEncryptedToo) {
  Json::Value doc = json("{'client_id': ''}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': '<>'}"));
  EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': ''}"));
}

TEST_F(SecretsTest, NullIsEncryptedAsTheEmptyText) {
  Json::Value doc = json("{'client_id': null, 'client_secret': null}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': '<>', 'client_secret': '<>'}"));
}

TEST_F(SecretsTest, NumberIsEncryptedAsItsText) {
  Json::Value doc = json("{'client_id': 42}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': '<42>'}"));
}

TEST_F(SecretsTest, TextEndsAtItsFirstNul) {
  Json::Value doc;
  doc["client_id"] = std::string("abc\0def", 7);
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': '<abc>'}"));
}

// The platform ----------------------------------------------------------------

TEST_F(SecretsTest, PlatformGetsAZeroedBufferOf1024Bytes) {
  std::vector<std::size_t> sizes;
  bool zeroed = true;
  const auto cipher = [&](const char* /*text*/, char* out, std::size_t size) {
    sizes.push_back(size);
    zeroed = zeroed && std::all_of(out, out + size, [](char c) { return c == '\0'; });
    std::fill_n(out, size - 1, 'x');
    return 1;
  };
  Platform::useCipher(cipher, cipher);
  OAUTHDBBasic::ParamEncrypt(both);
  OAUTHDBBasic::ParamDecrypt(both);
  EXPECT_THAT(sizes, ElementsAre(1024U, 1024U, 1024U, 1024U));
  EXPECT_TRUE(zeroed);
}

TEST_F(SecretsTest, LongestCiphertextFillsTheBuffer) {
  Json::Value doc;
  doc["client_id"] = std::string(1021, 'x');
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc["client_id"], "<" + std::string(1021, 'x') + ">");
}

TEST_F(SecretsTest, CiphertextWithoutRoomIsAFailure) {
  Json::Value doc;
  doc["client_id"] = std::string(1022, 'x');
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 0);
  EXPECT_EQ(doc["client_id"], std::string(1022, 'x'));
}

TEST_F(SecretsTest, OutputWithoutTerminatorEndsWithTheBuffer) {
  const auto cipher = [](const char* /*text*/, char* out, std::size_t size) {
    std::fill_n(out, size, 'x');
    return 1;
  };
  Platform::useCipher(cipher, cipher);
  Json::Value doc = json("{'client_id': 'abc'}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc["client_id"], std::string(1024, 'x'));
}

TEST_F(SecretsTest, OutputEndsAtItsFirstNul) {
  const auto cipher = [](const char* /*text*/, char* out, std::size_t /*size*/) {
    std::copy_n("ab\0cd", 6, out);
    return 1;
  };
  Platform::useCipher(cipher, cipher);
  Json::Value doc = json("{'client_id': 'abc'}");
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1);
  EXPECT_EQ(doc, json("{'client_id': 'ab'}"));
}

TEST_F(SecretsTest, EveryNonZeroAnswerIsASuccess) {
  for (const int answer : {1, 2, -1, 1024}) {
    const auto cipher = [answer](const char* /*text*/, char* out, std::size_t /*size*/) {
      *out = 'x';
      return answer;
    };
    Platform::useCipher(cipher, cipher);
    Json::Value doc = json("{'client_id': 'abc'}");
    EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(doc), 1) << answer;
    EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(doc), 1) << answer;
  }
}

// Failure ---------------------------------------------------------------------

TEST_F(SecretsTest, FailureOnTheIdentifierEndsTheConversion) {
  Platform::failEncryptFrom(1);
  const Json::Value before = both;
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(both), 0);
  EXPECT_EQ(both, before);
  EXPECT_THAT(Platform::encrypted(), ElementsAre("abc"));
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
}

TEST_F(SecretsTest, FailureOnTheSecretLeavesTheIdentifierConverted) {
  Platform::failEncryptFrom(2);
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(both), 0);
  EXPECT_EQ(both, json("{'client_secret': 'def', 'client_id': '<abc>', 'scope': 'read'}"));
  EXPECT_THAT(lines(), ElementsAre(plain("Data Encrypt failed")));
}

TEST_F(SecretsTest, FailedDecryptionHasItsOwnLine) {
  const Json::Value before = both;
  EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(both), 0);  // what is no ciphertext
  EXPECT_EQ(both, before);
  EXPECT_THAT(lines(), ElementsAre(plain("Data Decrypt failed")));
}

TEST_F(SecretsTest, FailedDecryptionOfTheSecretLeavesTheIdentifierConverted) {
  bothEncrypted["client_secret"] = "def";
  EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(bothEncrypted), 0);
  EXPECT_EQ(bothEncrypted, both);
  EXPECT_THAT(lines(), ElementsAre(plain("Data Decrypt failed")));
}

TEST_F(SecretsTest, OutputOfAFailedCallIsNotTaken) {
  const auto cipher = [](const char* /*text*/, char* out, std::size_t /*size*/) {
    *out = 'x';
    return 0;
  };
  Platform::useCipher(cipher, cipher);
  const Json::Value before = both;
  EXPECT_EQ(OAUTHDBBasic::ParamEncrypt(both), 0);
  EXPECT_EQ(OAUTHDBBasic::ParamDecrypt(both), 0);
  EXPECT_EQ(both, before);
}

// Traces ----------------------------------------------------------------------

TEST_F(SecretsTest, EveryMemberIsTracedByName) {
  EXPECT_THAT(
      tracedLines(1, [&] { OAUTHDBBasic::ParamEncrypt(both); }),
      ElementsAre(Line{kError, "==> %s[client_id]", "==> ParamEncrypt[client_id]"},
                  Line{kError, "==> %s[client_secret]", "==> ParamEncrypt[client_secret]"}));
  EXPECT_THAT(
      tracedLines(1, [&] { OAUTHDBBasic::ParamDecrypt(both); }),
      ElementsAre(Line{kError, "==> %s[client_id]", "==> ParamDecrypt[client_id]"},
                  Line{kError, "==> %s[client_secret]", "==> ParamDecrypt[client_secret]"}));
}

TEST_F(SecretsTest, ValuesAreNeverTraced) {
  for (const std::string& message : traced(-1, [&] { OAUTHDBBasic::ParamEncrypt(both); })) {
    EXPECT_EQ(message.find("abc"), std::string::npos) << message;
    EXPECT_EQ(message.find("def"), std::string::npos) << message;
  }
}

TEST_F(SecretsTest, MissingMembersAreNotTraced) {
  Json::Value doc = json("{'client_secret': 'def'}");
  EXPECT_THAT(traced(-1, [&] { OAUTHDBBasic::ParamEncrypt(doc); }),
              ElementsAre("==> ParamEncrypt[client_secret]"));
  doc = json("{}");
  EXPECT_THAT(traced(-1, [&] { OAUTHDBBasic::ParamEncrypt(doc); }), IsEmpty());
}

TEST_F(SecretsTest, ConversionIsSilentAtOtherLevels) {
  EXPECT_THAT(traced(2 + 4 + 8, [&] { OAUTHDBBasic::ParamEncrypt(both); }), IsEmpty());
}

TEST_F(SecretsTest, FailureFollowsTheTraceOfItsMember) {
  Platform::failEncryptFrom(2);
  EXPECT_THAT(traced(1, [&] { OAUTHDBBasic::ParamEncrypt(both); }),
              ElementsAre("==> ParamEncrypt[client_id]", "==> ParamEncrypt[client_secret]",
                          "Data Encrypt failed"));
}

}  // namespace
