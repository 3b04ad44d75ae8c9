#include "service/people/counter_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/service/people/scene.h"

namespace {

using keldoauth::service::CounterBucket;
using keldoauth::service::CounterFile;

constexpr std::size_t kFileBytes = 128 + 1280 * 128;

class CounterFileTest : public scene::Folder {
 protected:
  bool add(std::size_t bucket = 7) const {
    return CounterFile(at("counters")).change(bucket, [](CounterBucket& slots) {
      slots[0].tag = 1;
      ++slots[0].until;
      return true;
    });
  }
  /// What the file has; -1 when it cannot be had.
  [[nodiscard]] long long count(std::size_t bucket = 7) const {
    long long found = -1;
    const bool isThere = CounterFile(at("counters")).change(bucket, [&](CounterBucket& slots) {
      found = slots[0].until;
      return false;
    });
    return isThere ? found : -1;
  }
  [[nodiscard]] struct stat state() const {
    struct stat state {};
    EXPECT_EQ(lstat(at("counters").c_str(), &state), 0);
    return state;
  }
};

TEST_F(CounterFileTest, KeepsWhatWasChanged) {
  EXPECT_TRUE(add());
  EXPECT_TRUE(add());
  EXPECT_EQ(count(), 2);
}

TEST_F(CounterFileTest, BucketsHaveNothingInCommon) {
  add(0);
  add(CounterFile::kBuckets - 1);
  EXPECT_EQ(count(0), 1);
  EXPECT_EQ(count(1), 0);
  EXPECT_EQ(count(CounterFile::kBuckets - 2), 0);
  EXPECT_EQ(count(CounterFile::kBuckets - 1), 1);
}

TEST_F(CounterFileTest, ANewFileIsOurs) {
  const mode_t before = umask(0);
  add();
  umask(before);
  EXPECT_EQ(state().st_mode, S_IFREG | 0600U);
  EXPECT_EQ(state().st_size, off_t{kFileBytes});
  EXPECT_EQ(names(), std::vector<std::string>{"counters"});
}

TEST_F(CounterFileTest, WhatIsNotChangedIsNotWritten) {
  add();
  CounterFile file(at("counters"));
  EXPECT_TRUE(file.change(7, [](CounterBucket& slots) {
    slots[0].until = 99;
    return false;
  }));
  EXPECT_EQ(count(), 1);
}

TEST_F(CounterFileTest, AShortenedFileStartsAnew) {
  add();
  for (const off_t size : {off_t{0}, off_t{1}, off_t{128}, off_t{kFileBytes - 1}, off_t{1} << 20}) {
    ASSERT_EQ(truncate(at("counters").c_str(), size), 0);
    EXPECT_EQ(count(), 0) << size;
    EXPECT_EQ(state().st_size, off_t{kFileBytes});
  }
  EXPECT_EQ(names(), std::vector<std::string>{"counters"});
}

TEST_F(CounterFileTest, AFileOfAnotherShapeStartsAnew) {
  write("counters", std::string(kFileBytes, '\xFF'));
  EXPECT_EQ(count(), 0);
}

TEST_F(CounterFileTest, AFileThatOthersCanWriteStartsAnew) {
  add();
  for (const mode_t mode : {0620U, 0602U, 0604U, 0700U, 04600U}) {
    ASSERT_EQ(chmod(at("counters").c_str(), mode), 0);
    EXPECT_EQ(count(), 0) << mode;
    EXPECT_EQ(state().st_mode & 07777U, 0600U);
    add();
  }
}

TEST_F(CounterFileTest, AFileWithASecondNameStartsAnew) {
  add();
  ASSERT_EQ(link(at("counters").c_str(), at("second").c_str()), 0);
  EXPECT_EQ(count(), 0);
}

TEST_F(CounterFileTest, AFileOfSomebodyElseStartsAnew) {
  add();
  if (chown(at("counters").c_str(), 1, 1) != 0) {
    // Without the right to give files away nobody else's file can be made.
    ASSERT_EQ(errno, EINVAL);
    return;
  }
  EXPECT_EQ(count(), 0);
  EXPECT_EQ(state().st_uid, geteuid());
}

TEST_F(CounterFileTest, ALinkIsReplacedAndItsTargetLeftAlone) {
  write("target", "precious");
  ASSERT_EQ(symlink("target", at("counters").c_str()), 0);
  EXPECT_TRUE(add());
  EXPECT_EQ(read("target"), "precious");
  EXPECT_TRUE(S_ISREG(state().st_mode));
}

TEST_F(CounterFileTest, ANamedPipeIsReplaced) {
  ASSERT_EQ(mkfifo(at("counters").c_str(), 0600), 0);
  EXPECT_TRUE(add());
  EXPECT_EQ(count(), 1);
}

TEST_F(CounterFileTest, WhereNoFileCanBeItIsSaid) {
  ASSERT_EQ(mkdir(at("counters").c_str(), 0700), 0);
  EXPECT_FALSE(add());
  EXPECT_FALSE(CounterFile(at("missing/counters")).change(0, [](CounterBucket& /*slots*/) {
    ADD_FAILURE() << "there is nothing to see";
    return true;
  }));
  EXPECT_EQ(names(), std::vector<std::string>{"counters"});
}

TEST_F(CounterFileTest, WhoeverKeepsTheLockKeepsNobodyForLong) {
  add();
  const int holder = open(at("counters").c_str(), O_RDWR | O_CLOEXEC);
  ASSERT_EQ(flock(holder, LOCK_EX), 0);
  EXPECT_FALSE(add());
  close(holder);
  EXPECT_TRUE(add());
}

TEST_F(CounterFileTest, NoChangeOfManyProcessesIsLost) {
  constexpr int kProcesses = 4;
  constexpr int kTimes = 500;
  for (int i = 0; i < kProcesses; ++i) {
    if (fork() != 0) continue;
    for (int j = 0; j < kTimes; ++j) {
      if (!add()) _exit(1);
    }
    _exit(0);
  }
  for (int i = 0; i < kProcesses; ++i) {
    int status = 1;
    wait(&status);
    EXPECT_EQ(status, 0);
  }
  EXPECT_EQ(count(), kProcesses * kTimes);
}

}  // namespace
