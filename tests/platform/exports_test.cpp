// What the stand-ins show of themselves: the platform's functions, the
// platform's names, and no more libraries than they need.

#include <dlfcn.h>

#include <cstdio>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "tests/platform/platform_test.h"

namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using ::testing::UnorderedElementsAre;

/// Where the loader found the library.
std::string fileOf(const char* function) {
  Dl_info info{};
  EXPECT_NE(dladdr(reinterpret_cast<void*>(standIn<void()>(function)), &info), 0);
  return info.dli_fname != nullptr ? info.dli_fname : "";
}

std::vector<std::string> linesOf(const std::string& command) {
  const std::unique_ptr<FILE, int (*)(FILE*)> pipe(popen(command.c_str(), "r"), pclose);
  std::string output;
  for (int c = std::fgetc(pipe.get()); c != EOF; c = std::fgetc(pipe.get())) {
    output += static_cast<char>(c);
  }
  std::istringstream stream(output);
  std::vector<std::string> lines;
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

/// Names that begin with "__" belong to the compiler's instrumentation.
std::vector<std::string> exportsOf(const std::string& file) {
  return linesOf("readelf --dyn-syms --wide '" + file +
                 "' | awk '$5 ~ /GLOBAL|WEAK/ && $7 != \"UND\" && $8 !~ /^__/ {print $8}'");
}

/// What the dynamic section of the file says under this tag, in order.
std::vector<std::string> entriesOf(const std::string& file, const std::string& tag) {
  return linesOf("readelf --dynamic '" + file + "' | sed -n 's/.*(" + tag +
                 ").*\\[\\(.*\\)\\]/\\1/p'");
}

std::string sonameOf(const std::string& file) {
  const auto lines = entriesOf(file, "SONAME");
  return lines.empty() ? "" : lines.front();
}

TEST(ExportsTest, CipherExportsItsTwoFunctions) {
  EXPECT_THAT(exportsOf(fileOf("KCORECryptSzEncrypt")),
              UnorderedElementsAre("KCORECryptSzEncrypt", "KCORECryptSzDecrypt"));
}

TEST(ExportsTest, AddressExportsItsFunction) {
  EXPECT_THAT(exportsOf(fileOf("KeldCgiGetRemoteIP")), ElementsAre("KeldCgiGetRemoteIP"));
}

TEST(ExportsTest, LibrariesHaveThePlatformsPlainNames) {
  EXPECT_EQ(sonameOf(fileOf("KCORECryptSzEncrypt")), "libkeldcore.so");
  EXPECT_EQ(sonameOf(fileOf("KeldCgiGetRemoteIP")), "libkeldcgi.so");
}

/// Where the build found nettle as an archive, what the cipher uses of it is in
/// the cipher, and stays in there.
TEST(ExportsTest, CipherLoadsNettleOnlyWhereThereIsNoArchiveOfIt) {
  const auto needed = entriesOf(fileOf("KCORECryptSzEncrypt"), "NEEDED");
  EXPECT_THAT(needed, Contains(StartsWith("libc.")));
  const bool isThere = KELDCORE_NETTLE_ARCHIVE;
  EXPECT_THAT(needed, Contains(StartsWith("libnettle")).Times(isThere ? 0 : 1));
}

}  // namespace
