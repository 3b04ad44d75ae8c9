// Several requests bring the same code at the same moment: which operation lets
// exactly one of them have it.

#include <array>
#include <atomic>
#include <cstdlib>
#include <cstring>

#include "stores/oauth_grantCode.h"
#include "tests/load/processes.h"
#include "tests/support/long_form.h"
#include "tests/support/world.h"
#include "utils/oauth_names.h"

namespace load {
namespace {

namespace names = KELDOAUTHSERVER::names;
using KELDOAUTHSERVER::OAUTHDBGrantCode;

constexpr int kProcesses = 8;

/// A row as a request has read it before it redeems.
struct Found {
  std::string code;
  long long id;
};

using Redeem = bool (*)(OAUTHDBGrantCode& codes, const Found& found);

bool redeemByCode(OAUTHDBGrantCode& codes, const Found& found) {
  Json::Value request;
  request[names::kCondition][names::kCode] = found.code;
  return codes.DBDel(request);
}
bool redeemById(OAUTHDBGrantCode& codes, const Found& found) {
  return codes.Del(found.id) != 0;
}
bool redeemWithRevoke(OAUTHDBGrantCode& codes, const Found& found) {
  return codes.Revoke(found.id) != 0;
}

std::string issueCode(OAUTHDBGrantCode& codes) {
  Json::Value out;
  EXPECT_TRUE(codes.Add("alice", support::id64('c'), "read", "state", "", out));
  return out[names::kCode].asString();
}

/// With id 0 when there is no such code.
Found find(OAUTHDBGrantCode& codes, const std::string& code) {
  Json::Value rows;
  const bool found = codes.Get(code, &rows) != 0 && rows.size() == 1;
  return {code, found ? std::atoll(rows[0U][names::kId].asCString()) : 0};
}

struct Round {
  Barrier found{kProcesses};  // the last moment before the redemption
  std::array<char, 65> code{};
  std::atomic<int> finds{0};
  std::atomic<int> successes{0};
  std::atomic<int> errors{0};
};

class ExactlyOnceTest : public support::World {
 protected:
  /// Lets all processes redeem one code, with the row of it in hand; calls
  /// `check` after each round.
  void redeemAtOnce(Redeem redeem, const std::function<void()>& check) {
    const int rounds = support::isLongForm() ? 2000 : 100;
    const auto checkRound = [&] {
      EXPECT_EQ(round_->finds, kProcesses);
      EXPECT_EQ(round_->errors, 0);
      check();
    };
    const auto run = [&](int /*number*/) { request(redeem); };
    EXPECT_TRUE(hold({kProcesses, rounds, [this] { issue(); }, run, checkRound}));
    RecordProperty("rounds", rounds);
  }

  [[nodiscard]] std::string rowsOfTheCode() const {
    return sqlText("SELECT count(*) FROM oauth_grantCode WHERE code = '" +
                   std::string(round_->code.data()) + "'");
  }

  Shared<Round> round_;

 private:
  void issue() {
    SetUp();
    round_->finds = round_->successes = round_->errors = 0;
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    std::strncpy(round_->code.data(), issueCode(codes).c_str(), round_->code.size() - 1);
  }

  void request(Redeem redeem) {
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    const Found found = find(codes, round_->code.data());
    if (found.id > 0) ++round_->finds;
    round_->found.wait();
    if (redeem(codes, found)) ++round_->successes;
    if (codes.GetErrCode() != 255) ++round_->errors;
  }
};

TEST_F(ExactlyOnceTest, DeletingByCodeSucceedsForOneOfAll) {
  redeemAtOnce(redeemByCode, [this] {
    EXPECT_EQ(round_->successes, 1);
    EXPECT_EQ(rowsOfTheCode(), "0");
  });
}

TEST_F(ExactlyOnceTest, DelSucceedsForOneOfAll) {
  redeemAtOnce(redeemById, [this] {
    EXPECT_EQ(round_->successes, 1);
    EXPECT_EQ(rowsOfTheCode(), "0");
  });
}

TEST_F(ExactlyOnceTest, RevokeSucceedsForEachOfThem) {
  redeemAtOnce(redeemWithRevoke, [this] {
    EXPECT_EQ(round_->successes, kProcesses);
    EXPECT_EQ(rowsOfTheCode(), "1");
  });
}

/// One request is overtaken by another with the same code, and by the issue of
/// the next code, which gets the id of the one that is gone.
class OvertakenRequestTest : public ExactlyOnceTest {
 protected:
  void SetUp() override {
    ExactlyOnceTest::SetUp();
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    found_ = find(codes, issueCode(codes));
    EXPECT_TRUE(redeemByCode(codes, found_));
    next_ = issueCode(codes);
  }

  Found found_;
  std::string next_;
};

TEST_F(OvertakenRequestTest, DeletingByCodeFails) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  EXPECT_FALSE(redeemByCode(codes, found_));
  EXPECT_EQ(find(codes, next_).id, found_.id);
}

TEST_F(OvertakenRequestTest, DelSucceedsAndTakesTheNextCodeAway) {
  OAUTHDBGrantCode codes(names::kGrantCodeTable);
  EXPECT_TRUE(redeemById(codes, found_));
  EXPECT_EQ(find(codes, next_).id, 0);
}

}  // namespace
}  // namespace load
