// Many processes at once: one code, one refresh token, and a revocation beside a
// refresh.

#include <array>
#include <atomic>
#include <cstring>

#include "tests/grants/grants_test.h"
#include "tests/load/processes.h"
#include "tests/support/long_form.h"

namespace grants_test {
namespace {

constexpr int kProcesses = 16;

int rounds() {
  return support::isLongForm() ? 2000 : 12;
}

using SharedText = std::array<char, 200>;

void share(SharedText& shared, const std::string& text) {
  std::strncpy(shared.data(), text.c_str(), shared.size() - 1);
}

struct Round {
  load::Barrier start{kProcesses};
  load::Barrier pair{2};
  SharedText application{}, text{}, next{};
  std::atomic<int> successes{0};
  std::atomic<int> refusals{0};
  std::atomic<int> troubles{0};
};

class RacesTest : public GrantsTest {
 protected:
  /// All processes show the same text at the same moment.
  void showAtOnce(const std::function<std::string()>& draw,
                  const std::function<bool(Grants&)>& show) {
    const auto prepare = [&] {
      SetUp();
      round_->successes = round_->refusals = round_->troubles = 0;
      frame_ = add().identifier;
      share(round_->application, frame_.text());
      share(round_->text, draw());
      close();
    };
    const auto run = [&](int /*number*/) { one(show); };
    const auto check = [&] {
      EXPECT_EQ(round_->successes, 1);
      EXPECT_EQ(round_->refusals, kProcesses - 1);
      EXPECT_EQ(round_->troubles, 0);
      EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "1");
    };
    EXPECT_TRUE(load::hold({kProcesses, rounds(), prepare, run, check}));
    RecordProperty("rounds", rounds());
  }

  [[nodiscard]] ApplicationId application() const {
    return ApplicationId(round_->application.data());
  }

  load::Shared<Round> round_;
  ApplicationId frame_;

 private:
  void one(const std::function<bool(Grants&)>& show) try {
    Grants grants;
    round_->start.wait();
    ++(show(grants) ? round_->successes : round_->refusals);
  } catch (const Trouble&) {
    ++round_->troubles;
  }
};

TEST_F(RacesTest, OneOfAllRedeemsACode) {
  showAtOnce([this] { return issue(frame_).text(); },
             [this](Grants& grants) {
               return static_cast<bool>(
                   grants.codes.redeem(redemption(application(), Code(round_->text.data()))));
             });
}

TEST_F(RacesTest, OneOfAllRefreshes) {
  showAtOnce([this] { return login(frame_).refresh->text(); },
             [this](Grants& grants) {
               return static_cast<bool>(
                   grants.tokens.refresh({application(), RefreshToken(round_->text.data())}));
             });
}

/// One process refreshes while another ends the login; whoever came first, it
/// is gone.
class RevocationRaceTest : public RacesTest {
 protected:
  void endBesideRefresh(const std::function<void(Grants&)>& end) {
    const int times = support::isLongForm() ? 1000 : 25;
    const auto prepare = [&] {
      SetUp();
      frame_ = add().identifier;
      share(round_->application, frame_.text());
      const Pair pair = login(frame_);
      share(round_->text, pair.refresh->text());
      share(round_->next, pair.access.text());
      close();
    };
    const auto run = [&](int number) {
      Grants grants;
      round_->pair.wait();
      if (number == 0) {
        grants.tokens.refresh({application(), RefreshToken(round_->text.data())});
      } else {
        end(grants);
      }
    };
    const auto check = [&] { EXPECT_EQ(sqlText("SELECT COUNT(*) FROM oauth_token"), "0"); };
    EXPECT_TRUE(load::hold({2, times, prepare, run, check}));
    RecordProperty("races", times);
  }
};

TEST_F(RevocationRaceTest, ByRefreshTokenGoneIsGone) {
  endBesideRefresh([this](Grants& grants) {
    grants.tokens.revoke(application(), AnyToken(round_->text.data()));
  });
}

TEST_F(RevocationRaceTest, ByAccessTokenGoneIsGone) {
  endBesideRefresh([this](Grants& grants) {
    grants.tokens.revoke(application(), AnyToken(round_->next.data()));
  });
}

TEST_F(RevocationRaceTest, ByUserGoneIsGone) {
  endBesideRefresh([](Grants& grants) { grants.access.endUser(kAlice, kAdmin); });
}

TEST_F(RevocationRaceTest, ByRemovedApplicationGoneIsGone) {
  endBesideRefresh([this](Grants& grants) { grants.applications.remove(application(), kAdmin); });
}

}  // namespace
}  // namespace grants_test
