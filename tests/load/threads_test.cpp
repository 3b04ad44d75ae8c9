// Several threads with an object each. Without the doubles, whose locks would
// put in order what the library may do in any. Meant for ThreadSanitizer.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <array>
#include <atomic>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "stores/oauth_clientInfo.h"
#include "stores/oauth_grantCode.h"
#include "stores/oauth_log.h"
#include "stores/oauth_token.h"
#include "tests/support/long_form.h"
#include "tests/support/private_mounts.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace load {
namespace {

namespace fs = std::filesystem;
namespace names = KELDOAUTHSERVER::names;
using namespace KELDOAUTHSERVER;
using ::testing::AnyOf;
using ::testing::Each;

constexpr int kThreads = 4;

class ThreadsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    support::requirePrivateMounts();
    for (const char* file : {names::kDatabaseFile, names::kSettingsFile, names::kDebugFlagFile}) {
      fs::remove(file);
    }
  }

  /// Runs `body(0)`, `body(1)` and so on at the same time.
  static void inThreads(const std::function<void(int)>& body) {
    std::vector<std::thread> threads;
    for (int number = 0; number < kThreads; ++number) threads.emplace_back(body, number);
    for (std::thread& thread : threads) thread.join();
  }

  /// Puts a new settings file in place, as an editor does.
  static void replaceSettings(const std::string& text) {
    const std::string draft = std::string(names::kSettingsFile) + ".new";
    std::ofstream(draft) << text;
    fs::rename(draft, names::kSettingsFile);
  }

  const int rounds_ = support::isLongForm() ? 1000 : 20;
};

/// One object of each store.
struct Stores {
  OAUTHDBClientInfo clients{names::kClientInfoTable};
  OAUTHDBGrantCode codes{names::kGrantCodeTable};
  OAUTHDBToken tokens{names::kTokenTable};
  OAUTHDBLog log{names::kLogTable};
};

/// How many of the steps of a login succeed. Registration is left out: it
/// constructs an object, which is for one thread at a time.
int stepsOfALogin(Stores& stores, const std::string& user) {
  const std::string client = getRandomStr(64);
  Json::Value out;
  Json::Value rows;
  int done = 0;
  done += stores.codes.Add(user, client, "read", "state", "192.0.2.7", out) != 0;
  done += stores.codes.Del(stores.codes.GetIndex(out[names::kCode].asString())) != 0;
  done += stores.tokens.Add(user, client, "read", "code", "state", "192.0.2.7", out) != 0;
  const std::string token = out[names::kAccessToken].asString();
  done += stores.tokens.Verify(token, out) && out[names::kUsername] == user;
  done += stores.tokens.Revoke(stores.tokens.GetIndex(token));
  done += stores.clients.Get(&rows) != 0;
  done += stores.log.Add(user) != 0;
  return done;
}

TEST_F(ThreadsTest, ObjectsOfOneThreadServeOthers) {
  std::array<std::unique_ptr<Stores>, kThreads> stores;
  for (auto& each : stores) each = std::make_unique<Stores>();
  std::array<int, kThreads> steps{};

  inThreads([&](int number) {
    const auto mine = static_cast<std::size_t>(number);
    const std::string user = "user " + std::to_string(number);
    for (int i = 0; i < rounds_; ++i) steps[mine] += stepsOfALogin(*stores[mine], user);
  });
  EXPECT_THAT(steps, Each(7 * rounds_));
  for (auto& each : stores) {
    EXPECT_EQ(each->codes.GetErrCode(), 255) << each->codes.GetErrMsg();
    EXPECT_EQ(each->tokens.GetErrCode(), 255) << each->tokens.GetErrMsg();
    each.reset();
  }
}

mode_t modeOf(const std::string& path) {
  struct stat status {};
  EXPECT_EQ(stat(path.c_str(), &status), 0) << path;
  return status.st_mode & 07777U;
}

/// As root, without a privilege to switch, threads may well construct at once.
TEST_F(ThreadsTest, MissingFileIsCreatedOnceByThreadsThatConstructAtOnce) {
  for (int i = 0; i < rounds_; ++i) {
    fs::remove(names::kDatabaseFile);
    std::array<bool, kThreads> ready{};
    inThreads([&](int number) {
      OAUTHDBLog log(names::kLogTable);
      ready[static_cast<std::size_t>(number)] = log.Add("user") != 0;
    });
    EXPECT_THAT(ready, Each(true));
    EXPECT_EQ(modeOf(names::kDatabaseFile), 0600U);
    Json::Value rows;
    EXPECT_EQ(OAUTHDBLog(names::kLogTable).Get("", "", &rows), 1);
    EXPECT_EQ(rows.size(), static_cast<unsigned>(kThreads));
  }
}

TEST_F(ThreadsTest, FilesOfOtherThreadsKeepTheModesOfTheirUmask) {
  const mode_t callers = umask(022);
  std::atomic<bool> done{false};
  int made = 0;
  int wrong = 0;
  std::thread other([&] {
    for (; !done; ++made) {
      std::ofstream("/tmp/other") << "";
      if (modeOf("/tmp/other") != 0644U) ++wrong;
      fs::remove("/tmp/other");
    }
  });
  for (int i = 0; i < rounds_; ++i) {
    fs::remove(names::kDatabaseFile);
    const OAUTHDBLog log(names::kLogTable);
  }
  done = true;
  other.join();
  umask(callers);
  EXPECT_EQ(wrong, 0) << "of " << made;
}

TEST_F(ThreadsTest, SettingsAreReadWhileTheyChange) {
  const std::string few = R"({"token_max": 10, "token_expired": 20})";
  const std::string many = R"({"token_max": 1000, "token_expired": 2000})";
  replaceSettings(few);
  std::atomic<bool> done{false};
  std::thread editor([&] {
    for (int i = 0; !done; ++i) replaceSettings(i % 2 == 0 ? many : few);
  });
  inThreads([&](int /*number*/) {
    for (int i = 0; i < 10 * rounds_; ++i) {
      EXPECT_THAT(getTableRowMax(names::kTokenMax), AnyOf(10, 1000));
      EXPECT_THAT(getExpiredPeriod(names::kTokenExpired), AnyOf(20, 2000));
    }
  });
  done = true;
  editor.join();
}

TEST_F(ThreadsTest, EachThreadKeepsItsFirstLookAtTheSwitches) {
  replaceSettings(R"({"log_level": 64})");  // a class that no line has
  std::atomic<bool> done{false};
  std::thread operating([&] {
    while (!done) {
      std::ofstream(names::kDebugFlagFile) << "";
      fs::remove(names::kDebugFlagFile);
    }
  });
  for (int i = 0; i < rounds_; ++i) {
    inThreads([&](int /*number*/) {
      const bool enabled = isDebugEnabled();
      const int level = getLogLevel();
      for (int again = 0; again < 10; ++again) {
        EXPECT_EQ(isDebugEnabled(), enabled);
        EXPECT_EQ(getLogLevel(), level);
      }
    });
  }
  done = true;
  operating.join();
}

TEST_F(ThreadsTest, RandomTextsDiffer) {
  std::array<std::vector<std::string>, kThreads> texts;
  inThreads([&](int number) {
    for (int i = 0; i < rounds_; ++i) {
      texts[static_cast<std::size_t>(number)].push_back(getRandomStr(64));
    }
  });
  std::set<std::string> all;
  for (const auto& each : texts) all.insert(each.begin(), each.end());
  EXPECT_EQ(all.size(), static_cast<std::size_t>(kThreads * rounds_));
}

}  // namespace
}  // namespace load
