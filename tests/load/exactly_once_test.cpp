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

using Redeem = int (*)(OAUTHDBGrantCode& codes, long long id);

int redeemWithDel(OAUTHDBGrantCode& codes, long long id) {
  return codes.Del(id);
}
int redeemWithRevoke(OAUTHDBGrantCode& codes, long long id) {
  return codes.Revoke(id);
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
    Json::Value out;
    EXPECT_TRUE(codes.Add("alice", support::id64('c'), "read", "state", "", out));
    std::strncpy(round_->code.data(), out[names::kCode].asCString(), round_->code.size() - 1);
  }

  void request(Redeem redeem) {
    OAUTHDBGrantCode codes(names::kGrantCodeTable);
    Json::Value rows;
    const bool found = codes.Get(round_->code.data(), &rows) != 0 && rows.size() == 1;
    const long long id = found ? std::atoll(rows[0U][names::kId].asCString()) : 0;
    if (found) ++round_->finds;
    round_->found.wait();
    if (redeem(codes, id) != 0) ++round_->successes;
    if (codes.GetErrCode() != 255) ++round_->errors;
  }
};

TEST_F(ExactlyOnceTest, DelSucceedsForOneOfAll) {
  redeemAtOnce(redeemWithDel, [this] {
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

}  // namespace
}  // namespace load
