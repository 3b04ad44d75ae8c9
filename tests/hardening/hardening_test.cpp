// The built files, as the loader and an attacker see them.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/reader.h>

#include <array>
#include <cctype>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "tests/hardening/elf_file.h"

namespace hardening {
namespace {

namespace fs = std::filesystem;
using ::testing::AnyOf;
using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::IsSupersetOf;
using ::testing::StartsWith;

enum class Kind { kLibrary, kProgram };

struct BuiltFile {
  Kind kind;
  std::string path;
};
void PrintTo(const BuiltFile& file, std::ostream* out) {
  *out << file.path;
}

std::vector<BuiltFile> builtFiles() {
  std::vector<BuiltFile> files;
  for (const char* path : {HARDENING_LIBRARIES}) files.push_back({Kind::kLibrary, path});
  for (const char* path : {HARDENING_PROGRAMS}) files.push_back({Kind::kProgram, path});
  return files;
}

/// libkeldoauth is the first of them.
const char* const kLibrary = std::array{HARDENING_LIBRARIES}[0];

class HardeningTest : public ::testing::TestWithParam<BuiltFile> {
 protected:
  const ElfFile file_{GetParam().path};
};

TEST_P(HardeningTest, StackIsNotExecutable) {
  const auto stack = file_.segment(PT_GNU_STACK);
  ASSERT_TRUE(stack.has_value());
  EXPECT_EQ(stack->p_flags & PF_X, 0U);
}

TEST_P(HardeningTest, RelocationsBecomeReadOnly) {
  EXPECT_TRUE(file_.segment(PT_GNU_RELRO).has_value());
}

TEST_P(HardeningTest, SymbolsAreBoundAtOnce) {
  EXPECT_TRUE(file_.hasEntry(DT_BIND_NOW) || (file_.number(DT_FLAGS) & DF_BIND_NOW) != 0 ||
              (file_.number(DT_FLAGS_1) & DF_1_NOW) != 0);
}

TEST_P(HardeningTest, CodeIsNeverRelocated) {
  EXPECT_FALSE(file_.hasEntry(DT_TEXTREL));
  EXPECT_EQ(file_.number(DT_FLAGS) & DF_TEXTREL, 0U);
}

TEST_P(HardeningTest, NothingIsWritableAndExecutable) {
  const auto code = file_.segment(PT_LOAD);
  ASSERT_TRUE(code.has_value());
  EXPECT_NE(code->p_flags & (PF_W | PF_X), static_cast<unsigned>(PF_W | PF_X));
}

TEST_P(HardeningTest, IsLoadedAnywhere) {
  EXPECT_EQ(file_.type(), static_cast<unsigned>(ET_DYN));
  if (GetParam().kind == Kind::kLibrary) return;
  EXPECT_TRUE(file_.segment(PT_INTERP).has_value());
  EXPECT_NE(file_.number(DT_FLAGS_1) & DF_1_PIE, 0U);
}

/// In the build tree programs find the libraries by where they lie themselves.
/// A colon at the end is CMake's mark on what it takes out at installation.
TEST_P(HardeningTest, NamesNoSearchPathOfThisMachine) {
  EXPECT_FALSE(file_.hasEntry(DT_RPATH));
  const std::string path = file_.text(DT_RUNPATH);
  if (GetParam().kind == Kind::kLibrary) {
    EXPECT_EQ(path, "");
  } else {
    EXPECT_THAT(path, AnyOf("", "$ORIGIN:", "$ORIGIN/../", "$ORIGIN/../:"));
  }
}

std::string nameOf(const ::testing::TestParamInfo<BuiltFile>& file) {
  std::string name;
  for (const char c : fs::path(file.param.path).stem().string()) {
    name += std::isalnum(static_cast<unsigned char>(c)) != 0 ? c : '_';
  }
  return name;
}

INSTANTIATE_TEST_SUITE_P(BuiltFiles, HardeningTest, ::testing::ValuesIn(builtFiles()), nameOf);

// The static flavour --------------------------------------------------------------

#ifdef HARDENING_STATIC_PROGRAM
TEST(StaticFlavourTest, LoadsThePlatformAndTheCLibraryOnly) {
  const ElfFile program(HARDENING_STATIC_PROGRAM);
  EXPECT_THAT(program.needed(), IsSupersetOf({StartsWith("libkeldcore."), StartsWith("libkeldcgi."),
                                              StartsWith("libc.")}));
  EXPECT_THAT(program.needed(),
              Each(AnyOf(StartsWith("libkeldcore."), StartsWith("libkeldcgi."), StartsWith("libc."),
                         StartsWith("libm."), StartsWith("ld-linux"))));
}
#endif

// Stack protector -----------------------------------------------------------------

bool isForTests(const std::string& command) {
  return command.find(" -o tests/") != std::string::npos ||
         command.find(" -o bench/") != std::string::npos;
}

/// A file without a buffer on the stack has nothing to protect: what every
/// source was compiled with says more.
TEST(StackProtectorTest, EverySourceIsCompiledWithIt) {
  std::ifstream file(HARDENING_COMPILE_COMMANDS);
  Json::Value commands;
  file >> commands;
  int checked = 0;
  for (const Json::Value& command : commands) {
    const std::string line = command["command"].asString();
    if (isForTests(line)) continue;
    EXPECT_THAT(line, HasSubstr(" -fstack-protector-strong"));
    ++checked;
  }
  EXPECT_GT(checked, 20);
}

TEST(StackProtectorTest, GuardsTheBuffersOfLibraryCipherAndTool) {
  for (const char* path : {HARDENING_WITH_BUFFERS}) {
    EXPECT_TRUE(ElfFile(path).imports("__stack_chk_fail")) << path;
  }
}

// Time ----------------------------------------------------------------------------

/// Whatever toolchain file the build uses.
TEST(WideTimeTest, EverySourceIsCompiledForTimeAndFilesOf64Bits) {
  std::ifstream file(HARDENING_COMPILE_COMMANDS);
  Json::Value commands;
  file >> commands;
  for (const Json::Value& command : commands) {
    const std::string line = command["command"].asString();
    EXPECT_THAT(line, HasSubstr(" -D_TIME_BITS=64"));
    EXPECT_THAT(line, HasSubstr(" -D_FILE_OFFSET_BITS=64"));
  }
  EXPECT_GT(commands.size(), 20U);
}

/// What a 32-bit C library keeps for programs with a short time.
TEST(WideTimeTest, LibraryCallsNothingWithATimeOf32Bits) {
  if (sizeof(long) > 4) GTEST_SKIP() << "no such functions here";
  const ElfFile library(kLibrary);
  for (const char* name : {"time", "stat", "lstat", "fstat", "stat64", "lstat64", "fstat64",
                           "clock_gettime", "nanosleep", "open", "mknod64"}) {
    EXPECT_FALSE(library.imports(name)) << name;
  }
  for (const char* name :
       {"__time64", "__stat64_time64", "__fstat64_time64", "__clock_gettime64"}) {
    EXPECT_TRUE(library.imports(name)) << name;
  }
}

TEST(WideTimeTest, EverySourceOfTheLibraryRefusesAShortTime) {
  for (const char* path : {HARDENING_SOURCES}) {
    std::ifstream file(path);
    const std::string text{std::istreambuf_iterator<char>(file), {}};
    EXPECT_THAT(text, HasSubstr("\n#include \"utils/wide_time.h\"\n")) << path;
  }
}

// Unloading -----------------------------------------------------------------------

TEST(UnloadingTest, LibraryAsksToStayLoaded) {
  EXPECT_NE(ElfFile(kLibrary).number(DT_FLAGS_1) & DF_1_NODELETE, 0U);
}

// Installed files -----------------------------------------------------------------

TEST(InstalledFilesTest, NameNoSearchPath) {
  const std::string prefix = "/tmp/prefix";
  const std::string install = "cmake --install '" HARDENING_BUILD "' --prefix " + prefix;
  ASSERT_EQ(std::system((install + " >/tmp/install.log 2>&1").c_str()), 0);

  int checked = 0;
  for (const auto& entry : fs::recursive_directory_iterator(prefix)) {
    const std::string path = entry.path().string();
    const bool isProgram = path.find("bin/") != std::string::npos;
    if (!entry.is_regular_file() || (!isProgram && path.find(".so") == std::string::npos)) continue;
    const ElfFile file(path);
    EXPECT_FALSE(file.hasEntry(DT_RPATH)) << path;
    EXPECT_FALSE(file.hasEntry(DT_RUNPATH)) << path << ": " << file.text(DT_RUNPATH);
    ++checked;
  }
  EXPECT_GE(checked, 4);  // the library, the stand-ins, the tool
}

}  // namespace
}  // namespace hardening
