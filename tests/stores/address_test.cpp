// Which texts count as the address of a requester.

#include <gmock/gmock.h>
#include <json/value.h>

#include <boost/asio/ip/address.hpp>
#include <optional>
#include <random>
#include <string>

#include "tests/stores/text_operations.h"

using namespace KELDOAUTHSERVER;
using support::id64;
using support::SystemLog;
using ::testing::ElementsAre;

namespace {

class AddressTest : public StoreTest {
 protected:
  static void expectStored(const std::string& ip) {
    sql("DELETE FROM oauth_grantCode; DELETE FROM oauth_token;");
    EXPECT_TRUE(succeeded(addCode({{"ip", ip}}))) << ip;
    EXPECT_TRUE(succeeded(addToken({{"ip", ip}}))) << ip;
    EXPECT_EQ(onlyRow("oauth_grantCode")["ip"], ip);
    EXPECT_EQ(onlyRow("oauth_token")["ip"], ip);
  }

  static void expectRefused(const std::string& ip) {
    const Aftermath code = addCode({{"ip", ip}});
    EXPECT_TRUE(failedSilently(code)) << ip;
    EXPECT_THAT(code.lines, ElementsAre("oauth_grantCode:61 Bad IP address[Invalid argument]"));
    const Aftermath token = addToken({{"ip", ip}});
    EXPECT_TRUE(failedSilently(token)) << ip;
    EXPECT_THAT(token.lines, ElementsAre("oauth_token:65 Bad IP address[Invalid argument]"));
    EXPECT_EQ(rowCount("oauth_grantCode"), 0);
    EXPECT_EQ(rowCount("oauth_token"), 0);
  }
};

// By hand -----------------------------------------------------------------------

class Accepted : public AddressTest, public ::testing::WithParamInterface<const char*> {};
class Refused : public AddressTest, public ::testing::WithParamInterface<const char*> {};

TEST_P(Accepted, IsStored) {
  expectStored(GetParam());
}

INSTANTIATE_TEST_SUITE_P(Ipv4, Accepted,
                         ::testing::Values("0.0.0.0", "127.0.0.1", "192.168.1.254",
                                           "255.255.255.255"));
INSTANTIATE_TEST_SUITE_P(Ipv6, Accepted,
                         ::testing::Values("::", "::1", "2001:db8::1", "2001:DB8::ABCD",
                                           "1:2:3:4:5:6:7:8", "::ffff:10.0.0.1",
                                           "64:ff9b::192.0.2.33", "fe80::1", "ff02::1"));
INSTANTIATE_TEST_SUITE_P(Ipv6WithScope, Accepted,
                         ::testing::Values("fe80::1%lo", "ff02::1%lo", "fe80::1%1",
                                           "fe80::1%nosuchif0", "2001:db8::1%lo", "::1%4294967295",
                                           "fe80::1%-1", "fe80::1%", "fe80::1%a%b"));
INSTANTIATE_TEST_SUITE_P(Neither, Accepted, ::testing::Values(""));

TEST_P(Refused, IsLogged) {
  expectRefused(GetParam());
}

INSTANTIATE_TEST_SUITE_P(Ipv4, Refused,
                         ::testing::Values("999.1.1.1", "10.0.0.256", "10.0.0", "10.0.0.1.1",
                                           "10.0.0.", ".10.0.0.1", "10..0.1", "010.0.0.1",
                                           "10.0.0.01", "0x7f.0.0.1", "2130706433", "127.1",
                                           "10.0.0.-1", "10.0.0.1/24", "10.0.0.1:80", "10.0.0.1%lo",
                                           " 10.0.0.1", "10.0.0.1 ", "10.0.0.1\n", "+10.0.0.1",
                                           "1e1.0.0.1"));
INSTANTIATE_TEST_SUITE_P(Ipv6, Refused,
                         ::testing::Values(":", ":::", "1::2::3", "1:2:3:4:5:6:7",
                                           "1:2:3:4:5:6:7:8:9", "12345::", "g::1", "[::1]",
                                           "::1/64", " ::1", "::1 ", "::ffff:10.0.0.256",
                                           "::ffff:10.0.0", "fe80::1 %lo", "%lo", "%",
                                           "1:2:3:4:5:6:7:", ":1:2:3:4:5:6:7"));
INSTANTIATE_TEST_SUITE_P(Neither, Refused,
                         ::testing::Values(" ", "localhost", "None", "unknown", "'", "0", "-",
                                           "\xff\xfe"));

TEST_F(AddressTest, QuoteInAScopeIsStoredOnceByCodesAndDoubledByTokens) {
  ASSERT_TRUE(succeeded(addCode({{"ip", "fe80::1%'; DROP TABLE oauth_token; --"}})));
  ASSERT_TRUE(succeeded(addToken({{"ip", "fe80::1%'; DROP TABLE oauth_token; --"}})));
  EXPECT_EQ(onlyRow("oauth_grantCode")["ip"], "fe80::1%'; DROP TABLE oauth_token; --");
  EXPECT_EQ(onlyRow("oauth_token")["ip"], "fe80::1%''; DROP TABLE oauth_token; --");
}

TEST_F(AddressTest, LengthIsUnbounded) {
  expectStored("fe80::1%" + std::string(1 << 20, 's'));
  sql("DELETE FROM oauth_grantCode; DELETE FROM oauth_token;");
  expectRefused(std::string(1 << 20, '1'));
}

/// What is checked ends at a NUL byte. A token's address is quoted and so ends
/// there, too; a code's goes on as given and ends the statement.
TEST_F(AddressTest, TextBehindNulIsNotChecked) {
  const std::string ip("10.0.0.1\0nonsense", 17);
  ASSERT_TRUE(succeeded(addToken({{"ip", ip}})));
  EXPECT_EQ(onlyRow("oauth_token")["ip"], "10.0.0.1");
  EXPECT_TRUE(failed(addCode({{"ip", ip}}), 1, "unrecognized token: \"'10.0.0.1\""));
}

TEST_F(AddressTest, TextThatBeginsWithNulIsNotEmpty) {
  expectRefused(std::string("\0", 1));
  expectRefused(
      std::string("\0"
                  "10.0.0.1",
                  9));
}

// By comparison -------------------------------------------------------------------

/// Asks both stores, and the parser whose verdicts they are to give. Nothing is
/// stored: the user name is empty, which is found right after the address.
class AddressComparisonTest : public StoreTest {
 protected:
  void SetUp() override {
    StoreTest::SetUp();
    codes_.emplace(names::kGrantCodeTable);
    tokens_.emplace(names::kTokenTable);
  }

  void expectTheParsersVerdict(const std::string& ip) {
    boost::system::error_code error;
    boost::asio::ip::make_address(ip, error);
    const bool isRefused = !ip.empty() && error.failed();
    const Lines expected{isRefused ? "Bad IP address[" + error.message() + "]" : "Bad parameters"};
    ++(isRefused ? refused_ : accepted_);

    Json::Value out;
    SystemLog::clear();
    codes_->Add("", id64('c'), "read", "xyz", ip, out);
    EXPECT_EQ(SystemLog::messages(), expected) << ::testing::PrintToString(ip);
    SystemLog::clear();
    tokens_->Add("", id64('c'), "read", "flow", "xyz", ip, out);
    EXPECT_EQ(SystemLog::messages(), expected) << ::testing::PrintToString(ip);
  }

  int accepted_ = 0;
  int refused_ = 0;

 private:
  std::optional<OAUTHDBGrantCode> codes_;
  std::optional<OAUTHDBToken> tokens_;
};

const std::vector<std::string>& addresses() {
  static const std::vector<std::string> all{"0.0.0.0",
                                            "10.0.0.1",
                                            "255.255.255.255",
                                            "::",
                                            "::1",
                                            "2001:db8::1",
                                            "fe80::1",
                                            "ff02::1",
                                            "1:2:3:4:5:6:7:8",
                                            "::ffff:10.0.0.1",
                                            "64:ff9b::192.0.2.33",
                                            "2001:0db8:0000:0000:0000:ff00:0042:8329"};
  return all;
}

TEST_F(AddressComparisonTest, Surroundings) {
  const Lines around{"",
                     " ",
                     "\t",
                     "\n",
                     "0",
                     "1",
                     ":",
                     ".",
                     "%",
                     "[",
                     "]",
                     "/24",
                     "x",
                     "-",
                     "+",
                     "'",
                     std::string(1, '\0'),
                     std::string("\0x", 2),
                     std::string(300, ' ')};
  for (const std::string& address : addresses()) {
    for (const std::string& text : around) {
      expectTheParsersVerdict(text + address);
      expectTheParsersVerdict(address + text);
    }
  }
  EXPECT_GT(accepted_, 30);
  EXPECT_GT(refused_, 300);
}

TEST_F(AddressComparisonTest, Scopes) {
  const Lines scopes{"",
                     "lo",
                     "eth0",
                     "0",
                     "1",
                     "01",
                     "-1",
                     "4294967296",
                     "lo ",
                     " lo",
                     "%",
                     "%lo",
                     "lo%",
                     "::",
                     "10.0.0.1",
                     "'",
                     "\xff",
                     std::string("lo\0x", 4),
                     std::string(15, 'a'),
                     std::string(16, 'a'),
                     std::string(300, 'a'),
                     std::string(300, '9')};
  for (const std::string& address : addresses()) {
    for (const std::string& scope : scopes) expectTheParsersVerdict(address + "%" + scope);
  }
  EXPECT_GT(accepted_, 150);
  EXPECT_GT(refused_, 50);
}

TEST_F(AddressComparisonTest, Octets) {
  const Lines octets{
      "0",  "00",  "000", "07",  "010", "08",  "0x1", "1",          "9",
      "99", "100", "199", "249", "255", "256", "300", "999",        "1000",
      "-0", "+1",  " 1",  "1 ",  "",    "a",   "1e1", "4294967297", std::string(300, '0')};
  for (const std::string& octet : octets) {
    expectTheParsersVerdict(octet + ".0.0.1");
    expectTheParsersVerdict("10." + octet + ".0.1");
    expectTheParsersVerdict("10.0.0." + octet);
    expectTheParsersVerdict("::ffff:10.0.0." + octet);
    expectTheParsersVerdict(octet);
    expectTheParsersVerdict(octet + "." + octet);
    expectTheParsersVerdict("10.0.0.1." + octet);
  }
  EXPECT_GT(accepted_, 20);
  EXPECT_GT(refused_, 100);
}

TEST_F(AddressComparisonTest, Groups) {
  const Lines groups{"0",     "0000",
                     "00000", "f",
                     "F",     "ffff",
                     "fffff", "g",
                     "",      " ",
                     "-1",    "0x1",
                     "12",    "255.255.255.255",
                     "1.2.3", std::string(300, 'f')};
  for (const std::string& group : groups) {
    for (const char* before :
         {"", "::", ":", "1:", "1::", "1:2:3:4:5:6:", "1:2:3:4:5:6:7:", "::1:"}) {
      for (const char* behind : {"", "::", ":", ":1", "::1", ":2:3:4:5:6:7:8"}) {
        expectTheParsersVerdict(before + group + behind);
      }
    }
  }
  EXPECT_GT(accepted_, 100);
  EXPECT_GT(refused_, 300);
}

/// The same texts at each run.
TEST_F(AddressComparisonTest, ThousandsOfSmallChanges) {
  const std::string alphabet = std::string("0123456789abcdefF:.%/ []x-gl") + '\0';
  std::mt19937 random(20260101);
  const auto below = [&](std::size_t n) { return static_cast<std::size_t>(random() % n); };
  for (int i = 0; i < 4000; ++i) {
    std::string text = addresses()[below(addresses().size())];
    for (std::size_t change = below(3) + 1; change > 0; --change) {
      const std::size_t at = below(text.size() + 1);
      const char c = alphabet[below(alphabet.size())];
      switch (below(3)) {
        case 0:
          text.insert(at, 1, c);
          break;
        case 1:
          text.replace(at, 1, 1, c);
          break;
        default:
          text.erase(at, 1);
          break;
      }
    }
    expectTheParsersVerdict(text);
  }
  EXPECT_GT(accepted_, 400);
  EXPECT_GT(refused_, 400);
}

}  // namespace
