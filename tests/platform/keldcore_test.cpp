// The cipher: what its ciphertexts look like, what they give back, and what
// does not pass for one.

#include "platform/keldcore.h"

#include <cctype>
#include <string>
#include <thread>

#include "tests/platform/platform_test.h"
#include "tests/support/case_name.h"

namespace {

using support::id64;
using support::SystemLog;
using ::testing::IsEmpty;

const char kAlphabet[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
constexpr std::size_t kLongest = 751;  // its ciphertext has 1023 characters

class KeldcoreTest : public CipherTest {
 protected:
  void SetUp() override {
    CipherTest::SetUp();
    putKey(countingKey());
  }

  /// The cipher's real functions, with pointers that may be null.
  static int callWith(const char* name, const char* text, char* out, std::size_t size) {
    return standIn<decltype(KCORECryptSzEncrypt)>(name)(text, out, size);
  }
};

struct KnownAnswer {
  const char* name;
  const char* clear;
  const char* cipher;
};

// Put together from OpenSSL's CMAC and counter mode, for the key of the bytes 0
// to 63: an empty header, then the label "keldcore-1".
const KnownAnswer kKnownAnswers[] = {
    {"Empty", "", "BuUUoEG87WCe74gPRP1q0g"},
    {"OneCharacter", "a", "jf4XokfHciKdyy_1e6lVe_I"},
    {"BelowOneBlock", "0123456789abcde", "BK7s_XRd_OW_frIdLSAWVXJPLhLXM1235hK1_fCp8w"},
    {"OneBlock", "0123456789abcdef", "rwqI4GpWnqtiE8WKigDOydwSAGdLew4n2iTG3cHAI3g"},
    {"Identifier", "0123456789abcdef0123456789abcdef0123456789abcdef0123456789abcdef",
     "lmhSZFXuPBiS4V3DbrRoUQc6QuzpBNqKXfAT5QP9FK3mNMcN00Hl7f3mR70XDdFtS2FT-3DlCd9eyNqw3zkwmn5-"
     "VAyMhdDkZFS-dYDnaRA"},
    {"Utf8", "Grüße, 世界", "JT_xOek5E9VHhV3hNJeBt0-NEJROx8Zha_uU9mvSsg"},
    {"Quotes", "it''s", "I1Spu3kgSprGFBiRFhCCMUfjh9aN"},
};

class KnownAnswerTest : public KeldcoreTest, public ::testing::WithParamInterface<KnownAnswer> {};

TEST_P(KnownAnswerTest, IsWrittenAndReadBack) {
  EXPECT_EQ(encrypt(GetParam().clear), GetParam().cipher);
  EXPECT_EQ(decrypt(GetParam().cipher), GetParam().clear);
}

INSTANTIATE_TEST_SUITE_P(Cipher, KnownAnswerTest, ::testing::ValuesIn(kKnownAnswers),
                         support::CaseName());

TEST_F(KeldcoreTest, EveryByteComesBack) {
  std::string all;
  for (int byte = 1; byte < 256; ++byte) {
    const std::string one(1, static_cast<char>(byte));
    EXPECT_EQ(decrypt(encrypt(one).value_or("")), one) << byte;
    all += one;
  }
  EXPECT_EQ(decrypt(encrypt(all).value_or("")), all);
}

TEST_F(KeldcoreTest, TextOfEveryLengthComesBack) {
  std::string text;
  for (std::size_t length = 0; length <= kLongest; ++length) {
    ASSERT_EQ(decrypt(encrypt(text).value_or("")), text) << length;
    text += static_cast<char>('a' + length % 26);
  }
}

TEST_F(KeldcoreTest, CiphertextIsBase64UrlWithoutPadding) {
  for (std::size_t length = 0; length <= kLongest; ++length) {
    const std::string cipher = encrypt(std::string(length, 'x')).value_or("");
    EXPECT_EQ(cipher.size(), ((length + 16) * 4 + 2) / 3);
    EXPECT_EQ(cipher.find_first_not_of(kAlphabet), std::string::npos) << cipher;
  }
}

TEST_F(KeldcoreTest, EqualTextsHaveEqualCiphertexts) {
  EXPECT_EQ(encrypt(id64('a')), encrypt(id64('a')));
}

TEST_F(KeldcoreTest, OneOtherCharacterChangesTheWholeCiphertext) {
  const std::string one = encrypt(id64('a')).value_or("");
  const std::string other = encrypt(id64('a').replace(63, 1, "b")).value_or("");
  ASSERT_EQ(one.size(), other.size());
  int same = 0;
  for (std::size_t i = 0; i < one.size(); ++i) same += one[i] == other[i] ? 1 : 0;
  EXPECT_LT(same, 12);
}

TEST_F(KeldcoreTest, ThreadsAgree) {
  Text other;
  std::thread([&] { other = encrypt("text"); }).join();
  EXPECT_EQ(other, encrypt("text"));
}

TEST_F(KeldcoreTest, LongestTextOfTheLibrarysBufferHas751Bytes) {
  const std::string longest(kLongest, 'x');
  const Text cipher = encrypt(longest);
  ASSERT_TRUE(cipher.has_value());
  EXPECT_EQ(cipher->size(), 1023U);
  EXPECT_EQ(decrypt(*cipher), longest);
  EXPECT_EQ(encrypt(longest + 'x'), std::nullopt);
}

TEST_F(KeldcoreTest, CiphertextFitsExactlyWithItsTerminator) {
  const Text cipher = encrypt(id64('a'));
  ASSERT_TRUE(cipher.has_value());
  EXPECT_EQ(encrypt(id64('a'), cipher->size() + 1), cipher);
  for (std::size_t size = 0; size <= cipher->size(); ++size) {
    EXPECT_EQ(encrypt(id64('a'), size), std::nullopt) << size;
  }
}

TEST_F(KeldcoreTest, ClearTextFitsExactlyWithItsTerminator) {
  const std::string cipher = encrypt(id64('a')).value_or("");
  EXPECT_EQ(decrypt(cipher, 65), id64('a'));
  for (std::size_t size = 0; size <= 64; ++size) {
    EXPECT_EQ(decrypt(cipher, size), std::nullopt) << size;
  }
}

TEST_F(KeldcoreTest, EmptyTextNeedsRoomForItsTerminator) {
  const std::string cipher = encrypt("").value_or("");
  EXPECT_EQ(decrypt(cipher, 1), "");
  EXPECT_EQ(decrypt(cipher, 0), std::nullopt);
}

TEST_F(KeldcoreTest, LargerBuffersTakeLongerTexts) {
  for (std::size_t length = kLongest; length <= 4079; ++length) {
    const std::string text(length, 'x');
    ASSERT_TRUE(decrypt(encrypt(text, 8192).value_or(""), 8192) == text) << length;
  }
}

TEST_F(KeldcoreTest, EvenThenTextsBeyond4079BytesAreRefused) {
  EXPECT_EQ(encrypt(std::string(4080, 'x'), 8192), std::nullopt);
  EXPECT_EQ(decrypt(seal(countingKey(), "keldcore-1", std::string(4080, 'x')), 8192), std::nullopt);
}

TEST_F(KeldcoreTest, MegabyteIsRefused) {
  const std::string megabyte(1 << 20, 'A');
  EXPECT_EQ(encrypt(megabyte, 2 << 20), std::nullopt);
  EXPECT_EQ(decrypt(megabyte, 2 << 20), std::nullopt);
}

TEST_F(KeldcoreTest, NullPointersAreRefused) {
  char out[64];
  for (const char* name : {"KCORECryptSzEncrypt", "KCORECryptSzDecrypt"}) {
    EXPECT_EQ(callWith(name, nullptr, out, sizeof out), 0) << name;
    EXPECT_EQ(callWith(name, "BuUUoEG87WCe74gPRP1q0g", nullptr, sizeof out), 0) << name;
    EXPECT_EQ(callWith(name, "BuUUoEG87WCe74gPRP1q0g", nullptr, 0), 0) << name;
  }
}

TEST_F(KeldcoreTest, EveryFlippedBitIsNoticed) {
  const std::string cipher = encrypt(id64('a')).value_or("");
  for (std::size_t at = 0; at < cipher.size(); ++at) {
    for (int bit = 0; bit < 8; ++bit) {
      std::string changed = cipher;
      changed[at] = static_cast<char>(changed[at] ^ (1 << bit));
      EXPECT_EQ(decrypt(changed), std::nullopt) << at << ", bit " << bit;
    }
  }
}

// The last character carries bits that stand for nothing: they must be zero.
TEST_F(KeldcoreTest, EveryOtherCharacterIsNoticed) {
  const std::string cipher = encrypt(id64('a')).value_or("");
  for (std::size_t at = 0; at < cipher.size(); ++at) {
    for (const char character : std::string(kAlphabet)) {
      if (character == cipher[at]) continue;
      std::string changed = cipher;
      changed[at] = character;
      EXPECT_EQ(decrypt(changed), std::nullopt) << at << ": " << character;
    }
  }
}

TEST_F(KeldcoreTest, EveryTruncationIsNoticed) {
  for (const std::string& text : {std::string(), std::string("a"), id64('a')}) {
    const std::string cipher = encrypt(text).value_or("");
    for (std::size_t cut = 1; cut <= cipher.size(); ++cut) {
      EXPECT_EQ(decrypt(cipher.substr(cut)), std::nullopt) << "front " << cut;
      EXPECT_EQ(decrypt(cipher.substr(0, cipher.size() - cut)), std::nullopt) << "back " << cut;
    }
  }
}

TEST_F(KeldcoreTest, AnythingBesideTheCiphertextIsNoticed) {
  const std::string cipher = encrypt(id64('a')).value_or("");
  for (const std::string extra : {"=", "==", " ", "\n", "\t", "A", "AAAA", "'", "\xff"}) {
    EXPECT_EQ(decrypt(cipher + extra), std::nullopt) << "behind: " << extra;
    EXPECT_EQ(decrypt(extra + cipher), std::nullopt) << "before: " << extra;
    EXPECT_EQ(decrypt(cipher.substr(0, 8) + extra + cipher.substr(8)), std::nullopt)
        << "within: " << extra;
  }
}

TEST_F(KeldcoreTest, OrdinaryBase64IsNoCiphertext) {
  std::string cipher = "jf4XokfHciKdyy_1e6lVe_I";
  ASSERT_EQ(decrypt(cipher), "a");
  for (char& character : cipher) {
    if (character == '_') character = '/';
  }
  EXPECT_EQ(decrypt(cipher), std::nullopt);
}

TEST_F(KeldcoreTest, ClearTextIsNoCiphertext) {
  for (const std::string& text :
       {std::string("alice"), id64('a'), id64('-'), std::string("it's")}) {
    EXPECT_EQ(decrypt(text), std::nullopt) << text;
  }
}

TEST_F(KeldcoreTest, CiphertextOfAnotherVersionIsRefused) {
  ASSERT_EQ(decrypt(seal(countingKey(), "keldcore-1", "text")), "text");
  for (const char* label : {"keldcore-2", "keldcore-", "keldcore-11", ""}) {
    EXPECT_EQ(decrypt(seal(countingKey(), label, "text")), std::nullopt) << label;
  }
}

TEST_F(KeldcoreTest, CiphertextOfATextWithNulIsRefused) {
  using namespace std::string_literals;
  for (const std::string& text : {"\0"s, "a\0b"s, "text\0"s}) {
    EXPECT_EQ(decrypt(seal(countingKey(), "keldcore-1", text)), std::nullopt);
  }
}

TEST_F(KeldcoreTest, CiphertextOfAnotherKeyIsRefused) {
  const std::string cipher = encrypt("text").value_or("");
  for (std::size_t at = 0; at < 64; ++at) {
    std::string other = countingKey();
    other[at] = static_cast<char>(other[at] ^ 1);
    putKey(other);
    EXPECT_EQ(decrypt(cipher), std::nullopt) << "key byte " << at;
    EXPECT_NE(encrypt("text"), cipher) << "key byte " << at;
  }
}

TEST_F(KeldcoreTest, RefusedTextsAreNotLogged) {
  encrypt(std::string(kLongest + 1, 'x'));
  encrypt("text", 3);
  decrypt("no ciphertext");
  decrypt(id64('a'));
  decrypt(encrypt("text").value_or(""), 2);
  callWith("KCORECryptSzEncrypt", nullptr, nullptr, 0);
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

}  // namespace
