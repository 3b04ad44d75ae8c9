#include "tests/hardening/elf_file.h"

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iterator>
#include <stdexcept>

namespace hardening {

ElfFile::ElfFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  bytes_.assign(std::istreambuf_iterator<char>(file), {});
  if (bytes_.compare(0, SELFMAG, ELFMAG) != 0) throw std::runtime_error("no ELF file: " + path);
  header_ = at<ElfW(Ehdr)>(0);
  for (std::size_t i = 0; i < header_.e_shnum; ++i) {
    sections_.push_back(at<ElfW(Shdr)>(header_.e_shoff + i * header_.e_shentsize));
  }
  dynamic_ = table<ElfW(Dyn)>(SHT_DYNAMIC);
}

std::optional<ElfW(Phdr)> ElfFile::segment(unsigned kind) const {
  for (std::size_t i = 0; i < header_.e_phnum; ++i) {
    const auto segment = at<ElfW(Phdr)>(header_.e_phoff + i * header_.e_phentsize);
    if (segment.p_type == kind) return segment;
  }
  return std::nullopt;
}

bool ElfFile::hasEntry(std::int64_t tag) const {
  return std::any_of(dynamic_.begin(), dynamic_.end(),
                     [tag](const ElfW(Dyn) & entry) { return entry.d_tag == tag; });
}

std::uint64_t ElfFile::number(std::int64_t tag) const {
  for (const auto& entry : dynamic_) {
    if (entry.d_tag == tag) return entry.d_un.d_val;
  }
  return 0;
}

std::string ElfFile::text(std::int64_t tag) const {
  return hasEntry(tag) ? string(number(tag)) : "";
}

std::vector<std::string> ElfFile::needed() const {
  std::vector<std::string> names;
  for (const ElfW(Dyn) & entry : dynamic_) {
    if (entry.d_tag == DT_NEEDED) names.push_back(string(entry.d_un.d_val));
  }
  return names;
}

bool ElfFile::imports(const std::string& name) const {
  const auto symbols = table<ElfW(Sym)>(SHT_DYNSYM);
  return std::any_of(symbols.begin(), symbols.end(), [&](const ElfW(Sym) & symbol) {
    return symbol.st_shndx == SHN_UNDEF && string(symbol.st_name) == name;
  });
}

template <typename T>
T ElfFile::at(std::uint64_t offset) const {
  T value{};
  if (offset + sizeof value > bytes_.size()) throw std::out_of_range("ELF file is cut");
  std::memcpy(&value, bytes_.data() + offset, sizeof value);
  return value;
}

template <typename T>
std::vector<T> ElfFile::table(unsigned sectionType) const {
  std::vector<T> entries;
  for (const auto& section : sections_) {
    if (section.sh_type != sectionType) continue;
    for (std::uint64_t offset = 0; offset < section.sh_size; offset += sizeof(T)) {
      entries.push_back(at<T>(section.sh_offset + offset));
    }
  }
  return entries;
}

/// From the texts that the dynamic symbols and entries share.
std::string ElfFile::string(std::uint64_t offset) const {
  for (const auto& section : sections_) {
    if (section.sh_type != SHT_DYNAMIC) continue;
    return bytes_.c_str() + sections_.at(section.sh_link).sh_offset + offset;
  }
  return "";
}

}  // namespace hardening
