#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <limits>

#include "tests/support/case_name.h"
#include "tests/support/world.h"
#include "tests/utils/kernel.h"
#include "utils/oauth_names.h"
#include "utils/oauth_utils.h"

namespace {

using namespace KELDOAUTHSERVER;
using ::testing::IsEmpty;
namespace fs = std::filesystem;

constexpr int kDefaultRows = 1000;
constexpr int kDefaultSeconds = 600;
constexpr int kHighest = std::numeric_limits<int>::max();

std::string repeat(const std::string& text, int times) {
  std::string all;
  for (int i = 0; i < times; ++i) all += text;
  return all;
}

class SettingsTest : public support::World {
 protected:
  void SetUp() override {
    World::SetUp();
    Kernel::release();
  }
  void TearDown() override {
    Kernel::release();
    World::TearDown();
  }

  static void setTokenMax(const std::string& value) {
    writeSettings("{\"token_max\": " + value + "}");
  }

  static int tokenMax() { return getTableRowMax(names::kTokenMax); }
  static int codeLifetime() { return getExpiredPeriod(names::kGrantCodeExpired); }
};

// Values ----------------------------------------------------------------------

struct Value {
  const char* name;
  std::string json;
  int rows;
  int seconds;
};

void PrintTo(const Value& value, std::ostream* out) {
  *out << value.json.substr(0, 80);
}

class SettingsValueTest : public SettingsTest, public ::testing::WithParamInterface<Value> {};

TEST_P(SettingsValueTest, AsRowMax) {
  writeSettings("{\"client_info_max\": " + GetParam().json + "}");
  EXPECT_EQ(getTableRowMax(names::kClientInfoMax), GetParam().rows);
}

TEST_P(SettingsValueTest, AsPeriod) {
  writeSettings("{\"token_expired\": " + GetParam().json + "}");
  EXPECT_EQ(getExpiredPeriod(names::kTokenExpired), GetParam().seconds);
}

const Value kValues[] = {
    {"One", "1", 1, 1},
    {"BelowTheCap", "9999", 9999, 9999},
    {"TheCap", "10000", 10000, 10000},
    {"AboveTheCap", "10001", 10000, 10001},
    {"FarAboveTheCap", "50000", 10000, 50000},
    {"HighestInt", "2147483647", 10000, kHighest},
    {"Zero", "0", kDefaultRows, kDefaultSeconds},
    {"MinusOne", "-1", kDefaultRows, kDefaultSeconds},
    {"MinusFive", "-5", kDefaultRows, kDefaultSeconds},
    {"LowestInt", "-2147483648", kDefaultRows, kDefaultSeconds},
    {"AboveInt", "2147483648", kDefaultRows, kDefaultSeconds},
    {"BelowInt", "-2147483649", kDefaultRows, kDefaultSeconds},
    {"WrapsTo500In32Bits", "4294967796", kDefaultRows, kDefaultSeconds},
    {"Above64Bits", "99999999999999999999", kDefaultRows, kDefaultSeconds},
    {"Below64Bits", "-99999999999999999999", kDefaultRows, kDefaultSeconds},
    {"TenThousandDigits", repeat("9", 10000), kDefaultRows, kDefaultSeconds},
    {"RealWithFraction", "500.5", kDefaultRows, kDefaultSeconds},
    {"RealWithoutFraction", "500.0", 500, 500},  // an integer to JSON
    {"Exponent", "5e2", 500, 500},
    {"HugeExponent", "1e300", kDefaultRows, kDefaultSeconds},
    {"String", "\"500\"", kDefaultRows, kDefaultSeconds},
    {"EmptyString", "\"\"", kDefaultRows, kDefaultSeconds},
    {"True", "true", kDefaultRows, kDefaultSeconds},
    {"False", "false", kDefaultRows, kDefaultSeconds},
    {"Null", "null", kDefaultRows, kDefaultSeconds},
    {"Array", "[500]", kDefaultRows, kDefaultSeconds},
    {"Object", "{\"client_info_max\": 500}", kDefaultRows, kDefaultSeconds},
};

INSTANTIATE_TEST_SUITE_P(Settings, SettingsValueTest, ::testing::ValuesIn(kValues),
                         support::CaseName());

// Files -----------------------------------------------------------------------

struct File {
  const char* name;
  std::string text;
  int rows;
};

void PrintTo(const File& file, std::ostream* out) {
  *out << file.text.substr(0, 80);
}

class SettingsFileTest : public SettingsTest, public ::testing::WithParamInterface<File> {};

TEST_P(SettingsFileTest, IsReadOrAbsent) {
  writeSettings(GetParam().text);
  EXPECT_EQ(tokenMax(), GetParam().rows);
}

const File kFiles[] = {
    {"Empty", "", kDefaultRows},
    {"Blank", " \n\t ", kDefaultRows},
    {"EmptyObject", "{}", kDefaultRows},
    {"NullRoot", "null", kDefaultRows},
    {"NumberRoot", "500", kDefaultRows},
    {"StringRoot", "\"token_max\"", kDefaultRows},
    {"BooleanRoot", "true", kDefaultRows},
    {"EmptyArrayRoot", "[]", kDefaultRows},
    {"ArrayRoot", "[{\"token_max\": 500}]", kDefaultRows},
    {"NoJson", "token_max=500\n", kDefaultRows},
    {"NulBytes", std::string(64, '\0'), kDefaultRows},
    {"InvalidUtf8Garbage", "\xff\xfe\x80{", kDefaultRows},
    {"TruncatedBehindTheValue", R"({"token_max": 500)", kDefaultRows},
    {"TruncatedInALaterValue", R"({"token_max": 500, "log_max": )", kDefaultRows},
    {"TruncatedInALaterKey", R"({"token_max": 500, "log_m)", kDefaultRows},
    {"OtherKeysOnly", R"({"tokenmax": 500, "TOKEN_MAX": 500})", kDefaultRows},
    {"KeyInANestedObject", R"({"limits": {"token_max": 500}})", kDefaultRows},
    {"AmongOtherKeys", R"({"a": [1, {"b": null}], "token_max": 500, "z": "x"})", 500},
    {"Comments", "// rows\n{/* most */ \"token_max\": 500 // of tokens\n}", 500},
    {"WindowsLines", "{\r\n\"token_max\": 500\r\n}\r\n", 500},
    {"LastOfDuplicateKeys", R"({"token_max": 400, "token_max": 500})", 500},
    {"ManyKeys", "{" + repeat("\"filler\": \"............\", ", 2000) + "\"token_max\": 500}", 500},
    {"NestedFiveHundredDeep",
     "{\"x\": " + repeat("[", 500) + repeat("]", 500) + ", \"token_max\": 500}", 500},
    {"NestedFiveThousandDeep",
     "{\"x\": " + repeat("[", 5000) + repeat("]", 5000) + ", \"token_max\": 500}", kDefaultRows},
    {"ObjectsFiveThousandDeep", repeat("{\"token_max\":", 5000) + "1" + repeat("}", 5000),
     kDefaultRows},
    {"ArraysFiveThousandDeepUnclosed", repeat("[", 5000), kDefaultRows},
};

INSTANTIATE_TEST_SUITE_P(Settings, SettingsFileTest, ::testing::ValuesIn(kFiles),
                         support::CaseName());

TEST_F(SettingsTest, AbsentFileGivesDefaults) {
  EXPECT_EQ(codeLifetime(), kDefaultSeconds);
  EXPECT_EQ(getExpiredPeriod(names::kTokenExpired), kDefaultSeconds);
  EXPECT_EQ(tokenMax(), kDefaultRows);
  EXPECT_EQ(getLogLevel(), 0);
}

TEST_F(SettingsTest, DirectoryIsAbsent) {
  fs::create_directory(kSettings);
  EXPECT_EQ(tokenMax(), kDefaultRows);
  EXPECT_EQ(codeLifetime(), kDefaultSeconds);
}

TEST_F(SettingsTest, FifoIsAbsentAndNotWaitedFor) {
  ASSERT_EQ(mkfifo(kSettings, 0600), 0);
  EXPECT_EQ(tokenMax(), kDefaultRows);
}

TEST_F(SettingsTest, FifoThatStaysOpenIsAbsentAndNotWaitedFor) {
  ASSERT_EQ(mkfifo(kSettings, 0600), 0);
  const int descriptor = open(kSettings, O_RDWR | O_NONBLOCK);
  const std::string text = R"({"token_max": 500})";
  ASSERT_EQ(write(descriptor, text.data(), text.size()), static_cast<ssize_t>(text.size()));
  EXPECT_EQ(tokenMax(), kDefaultRows);
  std::string left(text.size(), ' ');
  EXPECT_EQ(read(descriptor, left.data(), left.size()), static_cast<ssize_t>(text.size()));
  EXPECT_EQ(left, text);  // its reader's, not ours
  close(descriptor);
}

TEST_F(SettingsTest, DeviceIsAbsentAndNotReadFrom) {
  fs::create_symlink("/dev/null", kSettings);
  EXPECT_EQ(tokenMax(), kDefaultRows);
  EXPECT_EQ(Kernel::reads(), 0);
}

TEST_F(SettingsTest, SocketIsAbsent) {
  const int descriptor = socket(AF_UNIX, SOCK_STREAM, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strncpy(address.sun_path, kSettings, sizeof address.sun_path - 1);
  ASSERT_EQ(bind(descriptor, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
  EXPECT_EQ(tokenMax(), kDefaultRows);
  close(descriptor);
}

TEST_F(SettingsTest, DanglingLinkIsAbsent) {
  fs::create_symlink("nowhere.cfg", kSettings);
  EXPECT_EQ(tokenMax(), kDefaultRows);
}

TEST_F(SettingsTest, LinkToAFileIsFollowed) {
  writeFile("/tmp/real.cfg", R"({"token_max": 500})");
  fs::create_symlink("/tmp/real.cfg", kSettings);
  EXPECT_EQ(tokenMax(), 500);
}

// Keys ------------------------------------------------------------------------

TEST_F(SettingsTest, EveryKeyHasItsOwnValue) {
  writeSettings(R"({"grantcode_expired": 11, "token_expired": 12, "client_info_max": 13,
                    "grantcode_max": 14, "token_max": 15, "log_max": 16, "log_level": 17})");
  EXPECT_EQ(getExpiredPeriod(names::kGrantCodeExpired), 11);
  EXPECT_EQ(getExpiredPeriod(names::kTokenExpired), 12);
  EXPECT_EQ(getTableRowMax(names::kClientInfoMax), 13);
  EXPECT_EQ(getTableRowMax(names::kGrantCodeMax), 14);
  EXPECT_EQ(getTableRowMax(names::kTokenMax), 15);
  EXPECT_EQ(getTableRowMax(names::kLogMax), 16);
  inFreshThread([] { EXPECT_EQ(getLogLevel(), 17); });
}

TEST_F(SettingsTest, KeysAreTheDocumentedOnes) {
  EXPECT_STREQ(names::kGrantCodeExpired, "grantcode_expired");
  EXPECT_STREQ(names::kTokenExpired, "token_expired");
  EXPECT_STREQ(names::kClientInfoMax, "client_info_max");
  EXPECT_STREQ(names::kGrantCodeMax, "grantcode_max");
  EXPECT_STREQ(names::kTokenMax, "token_max");
  EXPECT_STREQ(names::kLogMax, "log_max");
  EXPECT_STREQ(names::kLogLevel, "log_level");
}

TEST_F(SettingsTest, OneWrongValueLeavesTheOthersAlone) {
  writeSettings(R"({"grantcode_max": "many", "token_max": 500})");
  EXPECT_EQ(getTableRowMax(names::kGrantCodeMax), kDefaultRows);
  EXPECT_EQ(tokenMax(), 500);
}

TEST_F(SettingsTest, AnyKeyCanBeAskedFor) {
  writeSettings(R"({"": 7, "naïve": 8})");
  EXPECT_EQ(getTableRowMax(""), 7);
  EXPECT_EQ(getExpiredPeriod("naïve"), 8);
  EXPECT_EQ(getTableRowMax("oauth_token"), kDefaultRows);
  EXPECT_EQ(getExpiredPeriod(std::string(100000, 'k')), kDefaultSeconds);
}

// Reading ---------------------------------------------------------------------

TEST_F(SettingsTest, EditTakesEffectAtTheNextCall) {
  setTokenMax("7");
  EXPECT_EQ(tokenMax(), 7);
  setTokenMax("8");
  EXPECT_EQ(tokenMax(), 8);
  fs::remove(kSettings);
  EXPECT_EQ(tokenMax(), kDefaultRows);
}

TEST_F(SettingsTest, BrokenFileDoesNotSpoilTheNextReading) {
  for (const std::string& broken :
       {repeat("[", 5000), std::string(R"({"token_max": 7, "log_max": )"), std::string("/* ")}) {
    writeSettings(broken);
    EXPECT_EQ(tokenMax(), kDefaultRows);
    setTokenMax("500");
    EXPECT_EQ(tokenMax(), 500) << "after " << broken.substr(0, 40);
    writeSettings("{}");
    EXPECT_EQ(tokenMax(), kDefaultRows);
  }
}

/// A file of so many bytes that says 500 at its end.
void writeSettingsOfSize(std::size_t size) {
  const std::string end = "\"token_max\": 500}";
  std::ofstream(names::kSettingsFile) << '{' << std::string(size - end.size() - 1, ' ') << end;
}

/// Sizes around those of read buffers.
TEST_F(SettingsTest, FilesUpTo64KibibytesAreReadToTheEnd) {
  for (const std::size_t size : {4095U, 4096U, 4097U, 8192U, 65535U, 65536U}) {
    writeSettingsOfSize(size);
    EXPECT_EQ(tokenMax(), 500) << size << " bytes";
  }
}

TEST_F(SettingsTest, LargerFilesAreAbsent) {
  for (const std::size_t size : {65537U, 69632U, 1U << 20U}) {
    writeSettingsOfSize(size);
    EXPECT_EQ(tokenMax(), kDefaultRows) << size << " bytes";
    EXPECT_EQ(codeLifetime(), kDefaultSeconds);
  }
}

TEST_F(SettingsTest, NoMoreThan64KibibytesOfALargeFileAreLookedAt) {
  writeSettings("{");
  fs::resize_file(kSettings, 1U << 26U);
  EXPECT_EQ(tokenMax(), kDefaultRows);
  EXPECT_LE(Kernel::reads(), 17);  // of 4096 bytes each
}

TEST_F(SettingsTest, FileThatGrowsWhileItIsReadIsAbsentInTheEnd) {
  setTokenMax("500");
  int grown = 0;
  Kernel::beforeRead([&] {
    if (++grown > 100) return;
    std::ofstream(kSettings, std::ios::app) << std::string(4096, ' ');
  });
  EXPECT_EQ(tokenMax(), kDefaultRows);
  EXPECT_LE(grown, 17);
}

TEST_F(SettingsTest, FileIsOpenedOncePerCall) {
  setTokenMax("7");
  tokenMax();
  EXPECT_EQ(Kernel::opened(kSettings), 1);
  codeLifetime();
  EXPECT_EQ(Kernel::opened(kSettings), 2);
}

TEST_F(SettingsTest, NoDescriptorIsLeftOpen) {
  const auto descriptors = [] {
    return std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator());
  };
  const auto before = descriptors();
  setTokenMax("7");
  tokenMax();
  setTokenMax("[");
  tokenMax();
  fs::remove(kSettings);
  fs::create_directory(kSettings);
  tokenMax();
  EXPECT_EQ(descriptors(), before);
}

TEST_F(SettingsTest, FileIsNeverWritten) {
  writeSettings("{\"token_max\": \"x\"} ");
  tokenMax();
  EXPECT_EQ(readFile(kSettings), "{\"token_max\": \"x\"} ");
  fs::remove(kSettings);
  tokenMax();
  EXPECT_FALSE(fs::exists(kSettings));
}

TEST_F(SettingsTest, NothingIsLogged) {
  withDiagnostics(-1, [] {
    getTableRowMax(names::kTokenMax);
    getExpiredPeriod(names::kTokenExpired);
    writeSettings("{");
    getTableRowMax(names::kTokenMax);
  });
  EXPECT_THAT(support::SystemLog::lines(), IsEmpty());
}

}  // namespace
