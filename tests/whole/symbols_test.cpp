// What the built library offers to a linker, read from its own file.

#include <cxxabi.h>
#include <dlfcn.h>
#include <elf.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <link.h>

#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>
#include <memory>
#include <regex>
#include <set>
#include <string>
#include <vector>

#include "utils/oauth_utils.h"

using ::testing::Contains;
using ::testing::Each;
using ::testing::ElementsAreArray;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

namespace {

/// A shared library of this machine's own word size.
class SharedLibrary {
 public:
  explicit SharedLibrary(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    bytes_.assign(std::istreambuf_iterator<char>(file), {});
    const auto header = at<ElfW(Ehdr)>(0);
    for (std::size_t i = 0; i < header.e_shnum; ++i) {
      sections_.push_back(at<ElfW(Shdr)>(header.e_shoff + i * header.e_shentsize));
    }
  }

  /// The names of the symbols that it defines for others.
  [[nodiscard]] std::vector<std::string> exported() const {
    std::vector<std::string> names;
    for (const auto& symbol : table<ElfW(Sym)>(SHT_DYNSYM)) {
      const unsigned binding = ELF32_ST_BIND(symbol.st_info);  // the same for both sizes
      if (symbol.st_shndx != SHN_UNDEF && binding != STB_LOCAL) {
        names.push_back(text(SHT_DYNSYM, symbol.st_name));
      }
    }
    return names;
  }

  /// Texts of the dynamic section: DT_SONAME, DT_NEEDED...
  [[nodiscard]] std::vector<std::string> dynamicTexts(std::int64_t tag) const {
    std::vector<std::string> texts;
    for (const auto& entry : table<ElfW(Dyn)>(SHT_DYNAMIC)) {
      if (entry.d_tag == tag) texts.push_back(text(SHT_DYNAMIC, entry.d_un.d_val));
    }
    return texts;
  }

 private:
  template <typename Record>
  [[nodiscard]] Record at(std::size_t offset) const {
    Record record{};
    if (offset + sizeof(record) <= bytes_.size()) {
      std::memcpy(&record, bytes_.data() + offset, sizeof(record));
    }
    return record;
  }

  [[nodiscard]] ElfW(Shdr) section(unsigned type) const {
    for (const auto& section : sections_) {
      if (section.sh_type == type) return section;
    }
    ADD_FAILURE() << "no section of type " << type;
    return {};
  }

  template <typename Record>
  [[nodiscard]] std::vector<Record> table(unsigned type) const {
    const auto found = section(type);
    std::vector<Record> records;
    for (std::size_t i = 0; i < found.sh_size / sizeof(Record); ++i) {
      records.push_back(at<Record>(found.sh_offset + i * sizeof(Record)));
    }
    return records;
  }

  [[nodiscard]] std::string text(unsigned type, std::size_t offset) const {
    return bytes_.data() + sections_.at(section(type).sh_link).sh_offset + offset;
  }

  std::vector<char> bytes_;
  std::vector<ElfW(Shdr)> sections_;
};

/// As a reader would write it.
std::string readable(const std::string& symbol) {
  int status = 0;
  const std::unique_ptr<char, decltype(&std::free)> text(
      abi::__cxa_demangle(symbol.c_str(), nullptr, nullptr, &status), std::free);
  if (text == nullptr) return symbol;
  static const std::regex string(
      "std::__cxx11::basic_string<char, std::char_traits<char>, std::allocator<char> >");
  static const std::regex tag("\\[abi:cxx11\\]");
  return std::regex_replace(std::regex_replace(text.get(), string, "std::string"), tag, "");
}

class SymbolsTest : public ::testing::Test {
 protected:
  /// The library that this program runs with.
  static const SharedLibrary& library() {
    static const SharedLibrary loaded = [] {
      Dl_info info{};
      EXPECT_NE(dladdr(reinterpret_cast<void*>(&KELDOAUTHSERVER::isDebugEnabled), &info), 0);
      return SharedLibrary(info.dli_fname);
    }();
    return loaded;
  }

  /// Constructors and destructors, of which there are several of each, once.
  static std::set<std::string> exported() {
    std::set<std::string> names;
    for (const std::string& symbol : library().exported()) names.insert(readable(symbol));
    return names;
  }

  static std::set<std::string> listed() {
    std::ifstream file("tests/whole/exported_symbols.txt");
    std::set<std::string> names;
    for (std::string line; std::getline(file, line);) {
      if (!line.empty() && line.front() != '#') names.insert(line);
    }
    return names;
  }
};

TEST_F(SymbolsTest, AreThoseOfTheList) {
  EXPECT_THAT(exported(), ElementsAreArray(listed()));
}

TEST_F(SymbolsTest, AreAllOfOneNamespace) {
  EXPECT_THAT(exported(), Each(StartsWith("KELDOAUTHSERVER::")));
}

TEST_F(SymbolsTest, HoldNoTablesOfVirtualFunctions) {
  EXPECT_THAT(library().exported(), Each(Not(StartsWith("_ZT"))));
}

TEST_F(SymbolsTest, HoldNothingInAnotherNamespaceOfOurs) {
  EXPECT_THAT(exported(), Each(Not(HasSubstr("(anonymous namespace)"))));
  EXPECT_THAT(exported(), Each(Not(HasSubstr("{lambda"))));
}

TEST_F(SymbolsTest, StandInALibraryOfTheAgreedName) {
  EXPECT_THAT(library().dynamicTexts(DT_SONAME), ElementsAreArray({"libkeldoauth.so.1"}));
}

TEST_F(SymbolsTest, LibraryNeedsThePlatformAndSqliteAndNoBoost) {
  const auto needed = library().dynamicTexts(DT_NEEDED);
  for (const char* name : {"libkeldcore.so", "libkeldcgi.so", "libsqlite3.so.", "libjsoncpp.so."}) {
    EXPECT_THAT(needed, Contains(StartsWith(name)));
  }
  EXPECT_THAT(needed, Each(Not(HasSubstr("boost"))));
}

TEST_F(SymbolsTest, LibraryHasNoSearchPathOfItsOwn) {
  EXPECT_TRUE(library().dynamicTexts(DT_RPATH).empty());
  EXPECT_TRUE(library().dynamicTexts(DT_RUNPATH).empty());
}

}  // namespace
