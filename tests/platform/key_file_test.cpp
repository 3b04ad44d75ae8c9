// Which key file is good, which one is refused, and what the log says then.

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>

#include "tests/platform/platform_test.h"
#include "tests/platform/system_calls.h"
#include "tests/support/case_name.h"

namespace {

using support::FakeIds;
using support::SystemLog;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Not;

/// What the key of the bytes 0 to 63 makes of "".
const char kCipher[] = "BuUUoEG87WCe74gPRP1q0g";
const char kOtherFile[] = "/tmp/other.key";

class KeyFileTest : public CipherTest {
 protected:
  static std::size_t openFiles() { return filesIn("/proc/self/fd").size(); }
};

TEST_F(KeyFileTest, StandsInTheStateFolder) {
  putKey(countingKey());
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, EnvironmentNamesAnother) {
  putKey(std::string(64, 'x'));
  putKey(countingKey(), kOtherFile);
  useKeyFile(kOtherFile);
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, EmptyEnvironmentNamesNone) {
  putKey(countingKey());
  useKeyFile("");
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, RaisedPrivilegesIgnoreTheEnvironment) {
  putKey(countingKey());
  putKey(std::string(64, 'x'), kOtherFile);
  useKeyFile(kOtherFile);
  SystemCalls::raisePrivileges();
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, RelativePathIsFromTheWorkingFolder) {
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path("/tmp");
  useKeyFile("relative.key");
  const Text cipher = encrypt("text");
  std::filesystem::current_path(before);
  EXPECT_EQ(readFile("/tmp/relative.key").size(), 64U);
  useKeyFile("/tmp/relative.key");
  EXPECT_EQ(encrypt("text"), cipher);
}

TEST_F(KeyFileTest, OtherPathCountsAtOnce) {
  putKey(countingKey());
  putKey(std::string(64, 'x'), kOtherFile);
  ASSERT_EQ(encrypt(""), kCipher);
  useKeyFile(kOtherFile);
  EXPECT_NE(encrypt(""), kCipher);
  useKeyFile(kKeyFile);
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, KeyRenamedIntoPlaceCountsAtOnce) {
  putKey(std::string(64, 'x'));
  ASSERT_NE(encrypt(""), kCipher);
  putKey(countingKey());
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, KeyOpenedToOthersIsRefusedAtOnce) {
  putKey(countingKey());
  ASSERT_EQ(encrypt(""), kCipher);
  ASSERT_EQ(::chmod(kKeyFile, 0644), 0);
  EXPECT_EQ(encrypt(""), std::nullopt);
}

TEST_F(KeyFileTest, RefusedKeyIsTakenWhenItIsPutRight) {
  putKey(countingKey(), kKeyFile, 0640);
  ASSERT_EQ(encrypt(""), std::nullopt);
  ASSERT_EQ(::chmod(kKeyFile, 0600), 0);
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, ReadOnlyKeyIsGood) {
  putKey(countingKey(), kKeyFile, 0400);
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, FolderMayBeALink) {
  std::filesystem::create_directory("/tmp/real");
  std::filesystem::create_directory_symlink("/tmp/real", "/tmp/link");
  putKey(countingKey(), "/tmp/real/keldcore.key");
  useKeyFile("/tmp/link/keldcore.key");
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, GoodKeyIsReadWithoutALine) {
  putKey(countingKey());
  encrypt("text");
  EXPECT_THAT(SystemLog::lines(), IsEmpty());
}

TEST_F(KeyFileTest, KeyIsReadByteByByte) {
  putKey(countingKey());
  SystemCalls::moveOneByte();
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, InterruptedReadGoesOn) {
  putKey(countingKey());
  SystemCalls::follow([interrupted = false](const std::string& name) mutable {
    if (name != "read" || interrupted) return 0;
    interrupted = true;
    return EINTR;
  });
  EXPECT_EQ(encrypt(""), kCipher);
}

TEST_F(KeyFileTest, UnreadableKeyIsRefused) {
  putKey(countingKey());
  SystemCalls::fail("read", EIO);
  EXPECT_EQ(encrypt(""), std::nullopt);
  SystemCalls::release();
  expectOneLine(kKeyFile, "cannot be read");
}

TEST_F(KeyFileTest, KeyIsNeverLogged) {
  putKey(std::string(64, 'K'), kKeyFile, 0644);
  encrypt("text");
  putKey(std::string(65, 'K'));
  encrypt("text");
  const std::vector<std::string> texts = SystemLog::texts();
  ASSERT_EQ(texts.size(), 2U);
  for (const std::string& text : texts) EXPECT_EQ(text.find("KK"), std::string::npos) << text;
}

TEST_F(KeyFileTest, UnchangedKeyIsReadOnce) {
  putKey(countingKey());
  SystemCalls::follow([](const std::string&) { return 0; });
  for (int i = 0; i < 3; ++i) encrypt("text");
  EXPECT_THAT(SystemCalls::names(), ElementsAre("read"));
}

TEST_F(KeyFileTest, NoDescriptorStaysOpen) {
  const std::size_t before = openFiles();
  encrypt("text");
  putKey("short");
  encrypt("text");
  useKeyFile("/tmp/absent/keldcore.key");
  encrypt("text");
  EXPECT_EQ(openFiles(), before);
}

/// Something in the key's place that is refused for one reason.
struct BadKey {
  std::string name;
  std::function<void(const std::string& path)> put;
  std::string reason;
};

void PrintTo(const BadKey& bad, std::ostream* out) {
  *out << bad.name;
}

class BadKeyTest : public KeyFileTest, public ::testing::WithParamInterface<BadKey> {
 public:
  static BadKey size(const std::string& name, std::size_t size) {
    return {name, [size](const std::string& path) { putKey(std::string(size, 'k'), path); },
            "is not 64 bytes long"};
  }
  static BadKey mode(const std::string& name, unsigned mode) {
    return {name, [mode](const std::string& path) { putKey(countingKey(), path, mode); },
            "is open to group or others"};
  }
  static void putLink(const std::string& path) {
    putKey(countingKey(), kOtherFile);
    std::filesystem::create_symlink(kOtherFile, path);
  }
  static void putDanglingLink(const std::string& path) {
    std::filesystem::create_symlink("/tmp/absent.key", path);
  }
  static void putSocket(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    const int descriptor = ::socket(AF_UNIX, SOCK_STREAM, 0);
    ASSERT_EQ(::bind(descriptor, reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
    ::close(descriptor);
  }
  static void putForeignKey(const std::string& path) {
    putKey(countingKey(), path);
    FakeIds::use(1000, 1000);
  }
  static std::vector<BadKey> all();
};

std::vector<BadKey> BadKeyTest::all() {
  const auto pipe = [](const std::string& path) { ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0); };
  const auto folder = [](const std::string& path) { std::filesystem::create_directory(path); };
  const char* notRegular = "is not a regular file";
  return {
      size("Empty", 0),
      size("OneByteShort", 63),
      size("OneByteLong", 65),
      mode("GroupMayExecute", 0610),
      mode("GroupMayWrite", 0620),
      mode("GroupMayRead", 0640),
      mode("OthersMayExecute", 0601),
      mode("OthersMayWrite", 0602),
      mode("OthersMayRead", 0604),
      {"Folder", folder, notRegular},
      {"Pipe", pipe, notRegular},
      {"Socket", putSocket, "No such device or address"},
      {"LinkToAKey", putLink, "is a symbolic link"},
      {"DanglingLink", putDanglingLink, "is a symbolic link"},
      {"KeyOfAnotherUser", putForeignKey, "belongs to another user"},
  };
}

TEST_P(BadKeyTest, IsRefusedWithOneLinePerCall) {
  GetParam().put(kKeyFile);
  EXPECT_EQ(encrypt("text"), std::nullopt);
  expectOneLine(kKeyFile, GetParam().reason);
  EXPECT_EQ(decrypt(kCipher), std::nullopt);
  expectOneLine(kKeyFile, GetParam().reason);
}

TEST_P(BadKeyTest, NoOtherKeyIsMade) {
  GetParam().put(kKeyFile);
  SystemCalls::follow([](const std::string&) { return 0; });
  encrypt("text");
  EXPECT_THAT(SystemCalls::names(), Not(Contains("getentropy")));
}

TEST_P(BadKeyTest, StaysAsItIs) {
  GetParam().put(kKeyFile);
  struct stat before {};
  ::lstat(kKeyFile, &before);
  encrypt("text");
  struct stat after {};
  ASSERT_EQ(::lstat(kKeyFile, &after), 0);
  EXPECT_EQ(before.st_ino, after.st_ino);
  EXPECT_EQ(before.st_mode, after.st_mode);
  EXPECT_EQ(before.st_size, after.st_size);
  EXPECT_THAT(filesIn(kStateDir), ElementsAre("keldcore.key"));
}

INSTANTIATE_TEST_SUITE_P(KeyFile, BadKeyTest, ::testing::ValuesIn(BadKeyTest::all()),
                         support::CaseName());

}  // namespace
