// What the key file may say.

#include "tests/signing/signing_test.h"
#include "tests/support/case_name.h"

namespace signing_test {
namespace {

class KeySetTextTest : public SigningTest {
 protected:
  Json::Value document_ = parsed(anySet().text());

  [[nodiscard]] std::string failure() const {
    return failureOf([&] { KeySet::read(written(document_)); });
  }
};

TEST_F(KeySetTextTest, ReadsWhatItWrites) {
  KeySet set = anySet();
  set.rotate(kStart + 5);
  EXPECT_EQ(KeySet::read(set.text()).text(), set.text());
}

TEST_F(KeySetTextTest, FitsTheBoundOfTheFile) {
  EXPECT_LT(anySet().text().size() * kMaxKeys / 2, kMaxKeySetText);
}

TEST_F(KeySetTextTest, OrderOfTheKeysIsFree) {
  KeySet set = anySet();
  set.rotate(kStart);
  document_ = parsed(set.text());
  Json::Value reversed(Json::arrayValue);
  for (Json::ArrayIndex left = document_["keys"].size(); left > 0; --left) {
    reversed.append(document_["keys"][left - 1]);
  }
  document_["keys"] = reversed;
  EXPECT_EQ(KeySet::read(written(document_)).text(), set.text());
}

TEST_F(KeySetTextTest, TextThatIsNoObjectIsRefused) {
  for (const char* text : {"", "{", "[]", "null", "{} {}", "{}//", "/**/{}", "{'keys':[]}",
                           "{\"keys\":[],}", "{\"keys\":[],\"keys\":[]}",
                           "\xef\xbb\xbf"
                           "[1]"}) {
    EXPECT_EQ(failureOf([&] { KeySet::read(text); }), "is no JSON object") << text;
  }
  EXPECT_EQ(failureOf([] { KeySet::read(std::string(100000, '[')); }), "is no JSON object");
  EXPECT_EQ(failureOf([] { KeySet::read(std::string(kMaxKeySetText + 1, ' ')); }), "is too long");
}

TEST_F(KeySetTextTest, ObjectThatIsNoSetIsRefused) {
  for (const char* text : {"{}", "{\"keys\":{}}", "{\"keys\":null}", "{\"keys\":[],\"more\":1}"}) {
    EXPECT_EQ(failureOf([&] { KeySet::read(text); }), "is no set of keys") << text;
  }
}

TEST_F(KeySetTextTest, EachAlgorithmHasAKey) {
  document_["keys"].resize(1);
  EXPECT_EQ(failure(), "no key for ES256");
  document_["keys"].resize(0);
  EXPECT_EQ(failure(), "no key for RS256");
}

TEST_F(KeySetTextTest, KeysAreObjects) {
  document_["keys"][1] = "text";
  EXPECT_EQ(failure(), "key 2: is no object");
}

TEST_F(KeySetTextTest, NoKeyIsThereTwice) {
  document_["keys"].append(document_["keys"][0]);
  EXPECT_EQ(failure(), "key 3: is there twice");
}

TEST_F(KeySetTextTest, ThereAreBounds) {
  for (std::size_t i = 0; i < kMaxKeys; ++i) document_["keys"].append(Json::objectValue);
  EXPECT_EQ(failure(), "has too many keys");
}

/// A member of the first key set to something else.
struct BadMember {
  const char* name;
  const char* member;
  Json::Value value;
  const char* failure;
};

void PrintTo(const BadMember& row, std::ostream* out) {
  *out << row.name;
}

class BadMemberOfASetTest : public KeySetTextTest,
                            public ::testing::WithParamInterface<BadMember> {};

TEST_P(BadMemberOfASetTest, IsNamed) {
  document_["keys"][0][GetParam().member] = GetParam().value;
  EXPECT_EQ(failure(), std::string("key 1: ") + GetParam().failure);
}

const BadMember kBadMembers[] = {
    {"OneTooMany", "exp", 1, "has a member too many"},
    {"OtherUse", "use", "enc", "use does not fit"},
    {"OtherIdentifier", "kid", "mine", "kid does not fit"},
    {"NumberAsIdentifier", "kid", 1, "kid does not fit"},
    {"OtherAlgorithm", "alg", "none", "alg is neither RS256 nor ES256"},
    {"TextAsTime", "made", "1", "made is no number of seconds"},
    {"FractionAsTime", "made", 1.5, "made is no number of seconds"},
    {"WholeFractionAsTime", "signs_from", 1000.0, "signs_from is no number of seconds"},
    {"NullAsTime", "signs_from", Json::nullValue, "signs_from is no number of seconds"},
    {"NegativeTime", "signs_from", -1, "signs_from is out of bounds"},
    {"EndlessTime", "signs_from", Json::Int64(253402300800), "signs_from is out of bounds"},
    {"TimeBeyondInteger", "made", Json::UInt64(1) << 63U, "made is no number of seconds"},
};
INSTANTIATE_TEST_SUITE_P(KeySetText, BadMemberOfASetTest, ::testing::ValuesIn(kBadMembers),
                         support::CaseName());

TEST_F(KeySetTextTest, NoMemberMayBeMissing) {
  for (Json::ArrayIndex i = 0; i < 2; ++i) {
    for (const std::string& name : document_["keys"][i].getMemberNames()) {
      Json::Value changed = document_;
      changed["keys"][i].removeMember(name);
      EXPECT_NE(failureOf([&] { KeySet::read(written(changed)); }), "") << name;
    }
  }
}

}  // namespace
}  // namespace signing_test
