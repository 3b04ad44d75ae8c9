// The connection text: who may read it, and what it has to say.

#include "engines/postgresql/connection_text.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <stdexcept>
#include <string>

using keldoauth::postgresql::Options;
using keldoauth::postgresql::readServers;
using keldoauth::postgresql::Servers;
using ::testing::HasSubstr;
using ::testing::Not;

namespace {

constexpr char kFile[] = "/tmp/oauth.postgresql";
constexpr char kLocal[] = "host=/run/postgresql dbname=keldoauth user=keldoauth";

class ConnectionTextTest : public ::testing::Test {
 protected:
  void TearDown() override {
    std::remove(kFile);
    unsetenv("PGHOST");
    unsetenv("PGSSLROOTCERT");
  }

  static Servers read(const std::string& text, mode_t mode = 0600) {
    std::ofstream(kFile) << text;
    chmod(kFile, mode);
    return readServers(kFile);
  }

  static std::string refusal(const std::string& text, mode_t mode = 0600) {
    try {
      read(text, mode);
      return "not refused";
    } catch (const std::runtime_error& thrown) {
      return thrown.what();
    }
  }

  static std::string valueOf(const Options& options, const std::string& keyword) {
    std::string found;
    for (const auto& [key, value] : options) {
      if (key == keyword) found += "[" + value + "]";
    }
    return found;
  }
};

}  // namespace

TEST_F(ConnectionTextTest, NobodyElseMayReadIt) {
  EXPECT_EQ(refusal(kLocal), "not refused");
  for (const mode_t mode : {0640, 0604, 0620, 0610, 0601}) {
    EXPECT_THAT(refusal(kLocal, mode), HasSubstr("mode must be 0600")) << std::oct << mode;
  }
}

TEST_F(ConnectionTextTest, MustBeARegularFile) {
  std::remove(kFile);
  ASSERT_EQ(mkfifo(kFile, 0600), 0);
  EXPECT_THROW(readServers(kFile), std::runtime_error);
  std::remove(kFile);
  EXPECT_THROW(readServers(kFile), std::runtime_error);
}

TEST_F(ConnectionTextTest, HasLinesAndComments) {
  const Servers servers = read("# which\nhost=/run\n\ndbname=a\nuser='b c'\n");
  ASSERT_EQ(servers.size(), 1U);
  EXPECT_EQ(valueOf(servers[0], "user"), "[b c]");
}

TEST_F(ConnectionTextTest, EachHostIsAServer) {
  const Servers servers = read("host=db1,db2 port=5432,5433 dbname=a user=b sslmode=verify-full");
  ASSERT_EQ(servers.size(), 2U);
  EXPECT_EQ(valueOf(servers[1], "host"), "[db2]");
  EXPECT_EQ(valueOf(servers[1], "port"), "[5433]");
}

TEST_F(ConnectionTextTest, AServerElsewhereMustProveWhoItIs) {
  for (const char* mode : {"", " sslmode=require", " sslmode=verify-ca", " sslmode=prefer"}) {
    EXPECT_THAT(refusal("host=db1 dbname=a user=b" + std::string(mode)), HasSubstr("verify-full"))
        << mode;
  }
  EXPECT_EQ(refusal("host=db1 dbname=a user=b sslmode=verify-full"), "not refused");
  EXPECT_THAT(refusal("host=localhost hostaddr=10.0.0.1 dbname=a user=b"),
              HasSubstr("verify-full"));
  EXPECT_THAT(refusal("host=/run,db1 dbname=a user=b"), HasSubstr("verify-full"));
  EXPECT_THAT(refusal("host=127.db.example dbname=a user=b"), HasSubstr("verify-full"));
  EXPECT_EQ(refusal("host=127.0.0.1 dbname=a user=b"), "not refused");
}

TEST_F(ConnectionTextTest, TheEnvironmentDecidesNothing) {
  setenv("PGHOST", "elsewhere", 1);
  EXPECT_EQ(refusal(kLocal), "not refused");
  EXPECT_EQ(valueOf(read(kLocal)[0], "host"), "[/run/postgresql]");
  setenv("PGSSLROOTCERT", "/tmp/another", 1);
  EXPECT_THAT(refusal(kLocal), HasSubstr("PGSSLROOTCERT"));
}

TEST_F(ConnectionTextTest, MustSayAllThatMatters) {
  EXPECT_THAT(refusal("dbname=a user=b"), HasSubstr("must say host"));
  EXPECT_THAT(refusal("host=/run user=b"), HasSubstr("must say dbname"));
  EXPECT_THAT(refusal("host=/run dbname=a"), HasSubstr("must say user"));
  EXPECT_THAT(refusal("host=/run,/var dbname=a user=b port=1,2,3"), HasSubstr("not refused"));
  EXPECT_THAT(refusal("host=/run,/var,/tmp dbname=a user=b port=1,2"), HasSubstr("more hosts"));
}

TEST_F(ConnectionTextTest, WhatIsWrongWithItIsSaidWithoutIt) {
  const std::string reason = refusal("host=/run password=hidden nonsense");
  EXPECT_THAT(reason, HasSubstr("none that libpq understands"));
  EXPECT_THAT(reason, Not(HasSubstr("hidden")));
}

TEST_F(ConnectionTextTest, BytesStayAsTheyAre) {
  const Servers servers = read(std::string(kLocal) + " client_encoding=UTF8");
  EXPECT_EQ(valueOf(servers[0], "client_encoding"), "[SQL_ASCII]");
}
