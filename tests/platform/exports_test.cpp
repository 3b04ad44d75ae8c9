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

using ::testing::ElementsAre;
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

std::string sonameOf(const std::string& file) {
  const auto lines =
      linesOf("readelf --dynamic '" + file + "' | sed -n 's/.*(SONAME).*\\[\\(.*\\)\\]/\\1/p'");
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

}  // namespace
