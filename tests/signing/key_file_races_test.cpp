// Several processes at one key file.

#include <sys/file.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "tests/signing/calls.h"
#include "tests/signing/signing_test.h"

namespace signing_test {
namespace {

using ::testing::ElementsAre;

constexpr int kRacers = 8;

class RacesTest : public SigningTest {
 protected:
  /// How many of the processes that run `body` at once end well.
  static int winners(const std::function<void()>& body) {
    int gate[2];
    EXPECT_EQ(pipe(gate), 0);
    std::vector<pid_t> racers;
    for (int i = 0; i < kRacers; ++i) racers.push_back(racer(gate, body));
    close(gate[0]);
    close(gate[1]);  // opens it
    int won = 0;
    for (const pid_t child : racers) {
      int status = -1;
      EXPECT_EQ(waitpid(child, &status, 0), child);
      EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) <= 1) << status;
      won += status == 0 ? 1 : 0;
    }
    return won;
  }

 private:
  static pid_t racer(const int (&gate)[2], const std::function<void()>& body) {
    const pid_t child = fork();
    if (child != 0) return child;
    alarm(120);
    close(gate[1]);
    char byte = 0;
    while (read(gate[0], &byte, 1) > 0) {
    }
    _exit(failureOf(body).empty() ? 0 : 1);
  }
};

TEST_F(RacesTest, OneOfManyCreationsWins) {
  static_cast<void>(anySet());
  for (int round = 0; round < 20; ++round) {
    std::filesystem::remove(kPath);
    EXPECT_EQ(winners([] { KeyFile(kPath).create(anySet(), {}); }), 1);
    EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
    EXPECT_EQ(KeyFile(kPath).read().text(), anySet().text());
  }
}

TEST_F(RacesTest, ManyRotationsAreOne) {
  putAnySet();
  EXPECT_EQ(winners([] { KeyFile(kPath).update([](KeySet& set) { set.rotate(kStart); }); }),
            kRacers);
  EXPECT_EQ(KeyFile(kPath).read().keys().size(), 4U);
  EXPECT_THAT(filesIn(kFolder), ElementsAre("signing.json"));
}

// Each one moves the clock of the rotation on by what it finds: a change that
// was lost would show.
TEST_F(RacesTest, NoChangeIsLost) {
  putAnySet();
  const auto change = [](KeySet& set) {
    Json::Value document = parsed(set.text());
    Json::Value& made = document["keys"][0]["made"];
    made = made.asInt64() + 1;
    set = KeySet::read(written(document));
  };
  for (int round = 0; round < 10; ++round) {
    EXPECT_EQ(winners([&] { KeyFile(kPath).update(change); }), kRacers);
  }
  EXPECT_EQ(KeyFile(kPath).read().keys().front().made, kStart + 10 * kRacers);
}

// The file that was waited for is nobody's any more.
TEST_F(RacesTest, WhoWaitedWorksOnWhatTheOtherLeft) {
  putAnySet();
  KeySet other = anySet();
  other.replace(kStart + 1);
  bool isReplaced = false;
  Calls::follow([&](const std::string& name) {
    if (name != "flock" || isReplaced) return 0;
    isReplaced = true;
    writeFile("/tmp/keys/new", other.text());
    std::filesystem::rename("/tmp/keys/new", kPath);
    return 0;
  });
  KeyFile(kPath).update([&](KeySet& set) {
    EXPECT_EQ(set.text(), other.text());
    set.rotate(kStart + 1);
  });
  EXPECT_TRUE(isReplaced);
  Calls::release();
  EXPECT_EQ(KeyFile(kPath).read().keys().size(), 4U);
}

TEST_F(RacesTest, ReaderFindsWholeKeysWhileOthersChangeThem) {
  putAnySet();
  const pid_t writer = fork();
  if (writer == 0) {
    KeySet changed = anySet();
    changed.rotate(kStart);
    for (int round = 0; round < 100; ++round) {
      KeyFile(kPath).update([&](KeySet& set) { set = round % 2 == 0 ? changed : anySet(); });
    }
    _exit(0);
  }
  int status = -1;
  const KeyFile file(kPath);
  int reads = 0;
  do {
    EXPECT_EQ(failureOf([&] { static_cast<void>(file.read()); }), "");
    ++reads;
  } while (waitpid(writer, &status, WNOHANG) == 0);
  EXPECT_EQ(status, 0);
  EXPECT_GT(reads, 0);
}

}  // namespace
}  // namespace signing_test
