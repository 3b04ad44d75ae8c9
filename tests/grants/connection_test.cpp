// The connection: opening, and what an operation does when the store cannot.

#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>

#include "grants/grants.h"
#include "tests/grants/grants_test.h"

namespace grants_test {
namespace {

class ConnectionTest : public GrantsTest {
 protected:
  /// The kind of trouble; fails the test without any.
  template <typename Operation>
  static Trouble::Kind troubleIn(Operation operation) {
    try {
      operation();
    } catch (const Trouble& trouble) {
      return trouble.kind();
    }
    ADD_FAILURE() << "no trouble";
    return Trouble::Kind::kOther;
  }
};

TEST_F(ConnectionTest, AStoreThatCannotBeOpenedIsTrouble) {
  std::remove(kDatabase);
  ASSERT_EQ(mkdir(kDatabase, 0700), 0);
  EXPECT_EQ(troubleIn([] { Grants another; }), Trouble::Kind::kNotReady);
  ASSERT_EQ(rmdir(kDatabase), 0);
}

TEST_F(ConnectionTest, AFileThatIsNoDatabaseIsTrouble) {
  writeFile(kDatabase, std::string(5000, 'x'));
  EXPECT_THROW(Grants another, Trouble);
}

TEST_F(ConnectionTest, ATableThatIsGoneIsTroubleAndNoAnswer) {
  const ApplicationId frame = add().identifier;
  const Code code = issue(frame);
  sql("DROP TABLE oauth_grantCode");
  EXPECT_EQ(troubleIn([&] { grants().codes.redeem(redemption(frame, code)); }),
            Trouble::Kind::kOther);
  EXPECT_THROW(static_cast<void>(grants().access.list({})), Trouble);
  EXPECT_THROW(static_cast<void>(grants().room.count()), Trouble);
}

TEST_F(ConnectionTest, ATransactionThatIsLostHalfwayChangesNothing) {
  const ApplicationId frame = add().identifier;
  const Code code = issue(frame);
  sql("CREATE TRIGGER refuse AFTER UPDATE ON oauth_grantCode BEGIN "
      "SELECT RAISE(ROLLBACK, 'no'); END;");
  EXPECT_THROW(grants().codes.redeem(redemption(frame, code)), Trouble);
  sql("DROP TRIGGER refuse");
  EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "0");
  EXPECT_TRUE(grants().codes.redeem(redemption(frame, code)));
}

TEST_F(ConnectionTest, ATroubleIsToldByItsOwnReasonAndNotByTheLastOnes) {
  const ApplicationId frame = add().identifier;
  const Code code = issue(frame);
  const auto reasonWhen = [&](const std::string& happens) {
    sql("CREATE TRIGGER refuse BEFORE UPDATE ON oauth_grantCode BEGIN SELECT RAISE(" + happens +
        "); END;");
    std::string reason;
    try {
      grants().codes.redeem(redemption(frame, code));
    } catch (const Trouble& trouble) {
      reason = std::to_string(trouble.code()) + " " + trouble.what();
    }
    sql("DROP TRIGGER refuse");
    return reason;
  };
  EXPECT_EQ(reasonWhen("ABORT, 'no'"), "19 no");
  EXPECT_EQ(reasonWhen("IGNORE"), "1 a row is not as it was read a moment ago");
  EXPECT_TRUE(grants().codes.redeem(redemption(frame, code)));
}

TEST_F(ConnectionTest, ManyOperationsShareIt) {
  const ApplicationId frame = add().identifier;
  Pair pair = login(frame);
  for (int i = 0; i < 50; ++i) pair = refresh(frame, pair);
  EXPECT_TRUE(isGood(pair));
}

TEST_F(ConnectionTest, ACipherThatFailsIsTrouble) {
  const ApplicationId frame = add().identifier;
  support::Platform::failEncryptFrom(1);
  EXPECT_EQ(troubleIn([&] { grants().applications.find(frame); }), Trouble::Kind::kCipher);
  EXPECT_EQ(troubleIn([&] { grants().access.endApplication(frame, kAdmin); }),
            Trouble::Kind::kCipher);
  support::Platform::release();
}

}  // namespace
}  // namespace grants_test
