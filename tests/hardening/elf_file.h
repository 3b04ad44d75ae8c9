// What a program or shared library says of itself to the loader.

#ifndef KELDOAUTH_TESTS_HARDENING_ELF_FILE_H
#define KELDOAUTH_TESTS_HARDENING_ELF_FILE_H

#include <elf.h>
#include <link.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace hardening {

/// A file of this machine's own word size.
class ElfFile {
 public:
  explicit ElfFile(const std::string& path);

  /// ET_DYN for what can be loaded anywhere.
  [[nodiscard]] unsigned type() const { return header_.e_type; }

  /// The program header of this kind.
  [[nodiscard]] std::optional<ElfW(Phdr)> segment(unsigned kind) const;

  [[nodiscard]] bool hasEntry(std::int64_t tag) const;
  /// The number of a dynamic entry, 0 when it is absent.
  [[nodiscard]] std::uint64_t number(std::int64_t tag) const;
  /// The text of a dynamic entry, empty when it is absent.
  [[nodiscard]] std::string text(std::int64_t tag) const;

  /// The libraries that it names, in their order.
  [[nodiscard]] std::vector<std::string> needed() const;

  /// Whether it takes a symbol of this name from another file.
  [[nodiscard]] bool imports(const std::string& name) const;

 private:
  template <typename T>
  [[nodiscard]] T at(std::uint64_t offset) const;
  template <typename T>
  [[nodiscard]] std::vector<T> table(unsigned sectionType) const;
  [[nodiscard]] std::string string(std::uint64_t offset) const;

  std::string bytes_;
  ElfW(Ehdr) header_;
  std::vector<ElfW(Shdr)> sections_;
  std::vector<ElfW(Dyn)> dynamic_;
};

}  // namespace hardening

#endif  // KELDOAUTH_TESTS_HARDENING_ELF_FILE_H
