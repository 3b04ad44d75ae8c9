// The classes as a program that was built against an earlier library sees them,
// and the headers that it was built with.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

#include <sys/stat.h>

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <new>
#include <regex>
#include <string>
#include <type_traits>

#include "core/oauth_db_basic.h"
#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/world.h"

using namespace KELDOAUTHSERVER;
using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StrEq;

namespace {

/// The members of the base, in their order.
struct Members {
  int errorCode;
  int ready;
  std::string errorMessage;
  std::string tableName;
  void* database;
  void* lender;
};

// Classes -----------------------------------------------------------------------

template <typename Class>
class ClassTest : public ::testing::Test {};

using Classes =
    ::testing::Types<OAUTHDBBasic, OAUTHDBClientInfo, OAUTHDBGrantCode, OAUTHDBToken, OAUTHDBLog>;

struct ClassNames {
  template <typename Class>
  static std::string GetName(int i) {
    const char* names[] = {"Basic", "ClientInfo", "GrantCode", "Token", "Log"};
    return names[i];
  }
};
TYPED_TEST_SUITE(ClassTest, Classes, ClassNames);

TYPED_TEST(ClassTest, HasNoVirtualFunctions) {
  EXPECT_FALSE(std::is_polymorphic_v<TypeParam>);
}

TYPED_TEST(ClassTest, CanBeNeitherCopiedNorMoved) {
  EXPECT_FALSE(std::is_copy_constructible_v<TypeParam>);
  EXPECT_FALSE(std::is_copy_assignable_v<TypeParam>);
  EXPECT_FALSE(std::is_move_constructible_v<TypeParam>);
  EXPECT_FALSE(std::is_move_assignable_v<TypeParam>);
}

TYPED_TEST(ClassTest, HasTheMembersOfTheBaseAndNoMore) {
  EXPECT_EQ(sizeof(TypeParam), sizeof(Members));
  EXPECT_EQ(alignof(TypeParam), alignof(Members));
}

TYPED_TEST(ClassTest, DerivesPubliclyFromTheBase) {
  EXPECT_TRUE((std::is_convertible_v<TypeParam*, OAUTHDBBasic*>));
}

// Members -----------------------------------------------------------------------

class MembersTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    store_ = new (memory_) OAUTHDBToken("oauth_token");
  }
  void TearDown() override {
    store_->~OAUTHDBToken();
    World::TearDown();
  }

  template <typename Member>
  Member memberAt(std::size_t offset) const {
    Member member{};
    std::memcpy(&member, memory_ + offset, sizeof(member));
    return member;
  }
  /// A short text stands in the string itself.
  [[nodiscard]] std::string bytesOfStringAt(std::size_t offset) const {
    return {reinterpret_cast<const char*>(memory_) + offset, sizeof(std::string)};
  }

  alignas(OAUTHDBToken) unsigned char memory_[sizeof(OAUTHDBToken)] = {};
  OAUTHDBToken* store_ = nullptr;
};

TEST_F(MembersTest, ErrorCodeIsTheFirst) {
  EXPECT_EQ(memberAt<int>(offsetof(Members, errorCode)), 255);
  store_->SetErrCode(77);
  EXPECT_EQ(memberAt<int>(offsetof(Members, errorCode)), 77);
}

TEST_F(MembersTest, ReadyFlagIsTheSecond) {
  EXPECT_EQ(memberAt<int>(offsetof(Members, ready)), 1);
}

TEST_F(MembersTest, ErrorMessageIsTheThird) {
  store_->SetErrMsg("marker");
  EXPECT_THAT(bytesOfStringAt(offsetof(Members, errorMessage)), HasSubstr("marker"));
}

TEST_F(MembersTest, TableNameIsTheFourth) {
  store_->SetTabName("marker");
  EXPECT_THAT(bytesOfStringAt(offsetof(Members, tableName)), HasSubstr("marker"));
}

TEST_F(MembersTest, ConnectionIsTheFifth) {
  EXPECT_NE(memberAt<void*>(offsetof(Members, database)), nullptr);
}

TEST_F(MembersTest, OwnerOfALentConnectionIsTheLast) {
  EXPECT_EQ(memberAt<void*>(offsetof(Members, lender)), nullptr);
  void* const connection = memberAt<void*>(offsetof(Members, database));
  OAUTHDBToken owner("oauth_token");
  store_->~OAUTHDBToken();
  store_ = new (memory_) OAUTHDBToken("oauth_token", owner);
  EXPECT_EQ(memberAt<void*>(offsetof(Members, lender)), &owner);
  EXPECT_NE(memberAt<void*>(offsetof(Members, database)), connection);
  EXPECT_EQ(memberAt<int>(offsetof(Members, ready)), 1);
}

TEST_F(MembersTest, FailedOpenLeavesNeitherConnectionNorReadiness) {
  store_->~OAUTHDBToken();
  std::remove(kDatabase);
  ASSERT_EQ(mkdir(kDatabase, 0700), 0);
  store_ = new (memory_) OAUTHDBToken("oauth_token");
  EXPECT_EQ(memberAt<int>(offsetof(Members, ready)), 0);
  EXPECT_EQ(memberAt<void*>(offsetof(Members, database)), nullptr);
}

// Headers -----------------------------------------------------------------------

const char* const kPublicHeaders[] = {"core/oauth_db_basic.h",
                                      "core/oauth_errors.h",
                                      "core/transaction.h",
                                      "stores/oauth_clientInfo.h",
                                      "stores/oauth_grantCode.h",
                                      "stores/oauth_log.h",
                                      "stores/oauth_token.h",
                                      "utils/oauth_bounds.h",
                                      "utils/oauth_names.h",
                                      "utils/oauth_utils.h",
                                      "grants/access.h",
                                      "grants/applications.h",
                                      "grants/audit.h",
                                      "grants/codes.h",
                                      "grants/grants.h",
                                      "grants/outcome.h",
                                      "grants/policy.h",
                                      "grants/pushed.h",
                                      "grants/room.h",
                                      "grants/slice.h",
                                      "grants/texts.h",
                                      "grants/tokens.h",
                                      "grants/trouble.h"};

class HeaderTest : public ::testing::TestWithParam<const char*> {
 protected:
  static std::string text() {
    std::ifstream file(GetParam());
    EXPECT_TRUE(file) << GetParam();
    return {std::istreambuf_iterator<char>(file), {}};
  }
};

TEST_P(HeaderTest, BringsNeitherEngineNorBoost) {
  EXPECT_THAT(text(), Not(HasSubstr("sqlite3.h")));
  EXPECT_THAT(text(), Not(HasSubstr("boost")));
}

TEST_P(HeaderTest, OpensNoNamespaceForItsReaders) {
  EXPECT_THAT(text(), Not(HasSubstr("using namespace")));
}

TEST_P(HeaderTest, IncludesNothingThatIsNotInstalled) {
  const std::string header = text();
  const std::regex include("#include \"([^\"]+)\"");
  for (auto found = std::sregex_iterator(header.begin(), header.end(), include);
       found != std::sregex_iterator(); ++found) {
    EXPECT_THAT(kPublicHeaders, Contains(StrEq((*found)[1].str())));
  }
}

INSTANTIATE_TEST_SUITE_P(Public, HeaderTest, ::testing::ValuesIn(kPublicHeaders),
                         [](const auto& row) {
                           return std::regex_replace(std::string(row.param), std::regex("[/.]"),
                                                     "_");
                         });

}  // namespace
