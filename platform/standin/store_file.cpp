// SQLite's file format, as far as it takes to tell an empty table from one with
// rows: https://www.sqlite.org/fileformat2.html. What is not as expected is
// kUnknown, never a guess.

#include "platform/standin/store_file.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "utils/oauth_names.h"

namespace keldcore {
namespace {

namespace names = KELDOAUTHSERVER::names;

constexpr std::string_view kTablesWithSecrets[] = {names::kClientInfoTable, names::kGrantCodeTable,
                                                   names::kTokenTable};

// The format ------------------------------------------------------------------------

constexpr char kMagic[] = "SQLite format 3";  // its terminator included
constexpr std::size_t kFileHeader = 100;
constexpr std::size_t kPageSizeAt = 16;
constexpr std::size_t kWriteVersionAt = 18;
constexpr std::uint8_t kWalVersion = 2;

constexpr std::uint64_t kRootOfSchema = 1;
constexpr std::uint8_t kInteriorPage = 5;
constexpr std::uint8_t kLeafPage = 13;
constexpr std::size_t kCellCountAt = 3;
constexpr std::size_t kRightChildAt = 8;
constexpr std::size_t kLeafHeader = 8;
constexpr std::size_t kInteriorHeader = 12;

/// On smaller pages the columns that we read may be on another page; larger ones
/// would take much of a thread's stack. SQLite makes them of 4096 bytes.
constexpr std::size_t kSmallestPage = 1024;
constexpr std::size_t kLargestPage = 16384;

/// Bytes that are read from front to back; past their end all is 0 and the
/// reader is not good any more.
class Reader {
 public:
  Reader(const std::uint8_t* bytes, std::size_t size) : at_(bytes), left_(size) {}

  [[nodiscard]] bool isGood() const { return isGood_; }

  const std::uint8_t* take(std::uint64_t count) {
    isGood_ = isGood_ && count <= left_;
    if (!isGood_) return nullptr;
    const std::uint8_t* const taken = at_;
    at_ += count;
    left_ -= static_cast<std::size_t>(count);
    return taken;
  }

  std::uint64_t number(std::uint64_t width) {
    const std::uint8_t* const bytes = take(width);
    std::uint64_t value = 0;
    for (std::uint64_t i = 0; bytes != nullptr && i < width; ++i) value = value << 8 | bytes[i];
    return value;
  }

  /// Seven bits a byte as long as the eighth is set.
  std::uint64_t varint() {
    std::uint64_t value = 0;
    for (int i = 0; i < 9; ++i) {
      const std::uint64_t byte = number(1);
      if (i == 8) return value << 8 | byte;
      value = value << 7 | (byte & 0x7f);
      if ((byte & 0x80) == 0) return value;
    }
    return value;
  }

  std::string_view text(std::uint64_t serialType) {
    const std::uint64_t size = serialType >= 13 ? (serialType - 13) / 2 : 0;
    const std::uint8_t* const bytes = take(size);
    if (bytes == nullptr) return {};
    return {reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(size)};
  }

 private:
  const std::uint8_t* at_;
  std::size_t left_;
  bool isGood_ = true;
};

/// 0 for what is no whole number above 1.
std::uint64_t integer(Reader& reader, std::uint64_t serialType) {
  constexpr std::array<std::uint64_t, 7> kWidths{0, 1, 2, 3, 4, 6, 8};
  if (serialType >= kWidths.size()) return 0;
  return reader.number(kWidths[static_cast<std::size_t>(serialType)]);
}

class StoreFile {
 public:
  explicit StoreFile(int descriptor) : descriptor_(descriptor) {}

  StoredValues values() {
    std::array<std::uint8_t, kFileHeader> header{};
    if (!read(0, header.data(), header.size()) ||
        std::memcmp(header.data(), kMagic, sizeof kMagic) != 0) {
      return StoredValues::kUnknown;
    }
    pageSize_ = static_cast<std::size_t>(Reader(header.data() + kPageSizeAt, 2).number(2));
    isWal_ = header[kWriteVersionAt] == kWalVersion;
    if (pageSize_ < kSmallestPage || pageSize_ > kLargestPage) return StoredValues::kUnknown;
    return inSchema();
  }

  [[nodiscard]] bool isWal() const { return isWal_; }

 private:
  using Page = std::array<std::uint8_t, kLargestPage>;

  [[nodiscard]] bool read(std::uint64_t at, std::uint8_t* bytes, std::size_t size) const {
    ssize_t got = 0;
    do {
      got = pread(descriptor_, bytes, size, static_cast<off_t>(at));
    } while (got < 0 && errno == EINTR);
    return got == static_cast<ssize_t>(size);
  }

  [[nodiscard]] bool readPage(std::uint64_t number, std::uint8_t* bytes, std::size_t size) const {
    return number > 0 && number <= UINT32_MAX && read((number - 1) * pageSize_, bytes, size);
  }

  /// Of the tables that the schema names. Its some ten entries need no more than
  /// two floors of pages.
  StoredValues inSchema() {
    Page root;
    if (!readPage(kRootOfSchema, root.data(), pageSize_)) return StoredValues::kUnknown;
    if (root[kFileHeader] == kLeafPage) return inLeaf(root, kFileHeader);
    if (root[kFileHeader] != kInteriorPage) return StoredValues::kUnknown;

    const std::uint8_t* const lastChild = root.data() + kFileHeader + kRightChildAt;
    StoredValues found = inChild(Reader(lastChild, 4).number(4));
    for (std::uint64_t i = 0; i < cellCount(root, kFileHeader); ++i) {
      if (found != StoredValues::kNone) return found;
      Reader cell = cellAt(root, kFileHeader + kInteriorHeader, i);
      found = inChild(cell.number(4));
    }
    return found;
  }

  StoredValues inChild(std::uint64_t number) {
    Page page;
    const bool isLeaf = readPage(number, page.data(), pageSize_) && page[0] == kLeafPage;
    return isLeaf ? inLeaf(page, 0) : StoredValues::kUnknown;
  }

  StoredValues inLeaf(const Page& page, std::size_t headerAt) {
    StoredValues found = StoredValues::kNone;
    for (std::uint64_t i = 0; i < cellCount(page, headerAt); ++i) {
      if (found != StoredValues::kNone) return found;
      Reader cell = cellAt(page, headerAt + kLeafHeader, i);
      found = inEntry(cell);
    }
    return found;
  }

  static std::uint64_t cellCount(const Page& page, std::size_t headerAt) {
    return Reader(page.data() + headerAt + kCellCountAt, 2).number(2);
  }

  /// From the start of a cell to the end of its page; empty for one that lies
  /// outside.
  [[nodiscard]] Reader cellAt(const Page& page, std::size_t pointersAt, std::uint64_t index) const {
    const auto pointerAt = static_cast<std::size_t>(pointersAt + 2 * index);
    if (pointerAt + 2 > pageSize_) return {page.data(), 0};
    const auto cell = static_cast<std::size_t>(Reader(page.data() + pointerAt, 2).number(2));
    if (cell >= pageSize_) return {page.data(), 0};
    return {page.data() + cell, pageSize_ - cell};
  }

  /// One row of the schema: type, name, table, root page and text.
  StoredValues inEntry(Reader& cell) {
    cell.varint();  // size
    cell.varint();  // row id
    Reader types = cell;
    const std::uint64_t headerSize = types.varint();
    cell.take(headerSize);
    const std::string_view type = cell.text(types.varint());
    const std::string_view name = cell.text(types.varint());
    cell.text(types.varint());
    const std::uint64_t root = integer(cell, types.varint());
    if (!cell.isGood() || !types.isGood()) return StoredValues::kUnknown;

    const bool isOurs =
        type == "table" && std::find(std::begin(kTablesWithSecrets), std::end(kTablesWithSecrets),
                                     name) != std::end(kTablesWithSecrets);
    return isOurs ? inTable(root) : StoredValues::kNone;
  }

  /// A table that has lost all its rows is one leaf without cells again.
  StoredValues inTable(std::uint64_t root) {
    std::array<std::uint8_t, kLeafHeader> header{};
    if (!readPage(root, header.data(), header.size())) return StoredValues::kUnknown;
    if (header[0] == kInteriorPage) return StoredValues::kSome;
    if (header[0] != kLeafPage) return StoredValues::kUnknown;
    const bool isEmpty = Reader(header.data() + kCellCountAt, 2).number(2) == 0;
    return isEmpty ? StoredValues::kNone : StoredValues::kSome;
  }

  int descriptor_;
  std::size_t pageSize_ = 0;
  bool isWal_ = false;
};

// The file --------------------------------------------------------------------------

bool isReadable(int descriptor) {
  const int flags = fcntl(descriptor, F_GETFL);
  return flags >= 0 && (flags & O_PATH) == 0 && (flags & O_ACCMODE) != O_WRONLY;
}

/// One that this process has open on the file; -1 for none.
int openDescriptorOn(const struct stat& file) {
  DIR* const folder = opendir("/proc/self/fd");
  if (folder == nullptr) return -1;
  int found = -1;
  while (const dirent* const entry = readdir(folder)) {
    const int descriptor = static_cast<int>(std::strtol(entry->d_name, nullptr, 10));
    struct stat status {};
    if (entry->d_name[0] == '.' || fstat(descriptor, &status) != 0) continue;
    if (status.st_dev != file.st_dev || status.st_ino != file.st_ino) continue;
    if (isReadable(descriptor)) found = descriptor;
  }
  closedir(folder);
  return found;
}

bool hasContent(const char* path, const char* suffix) {
  std::array<char, PATH_MAX> name{};
  std::snprintf(name.data(), name.size(), "%s%s", path, suffix);
  struct stat status {};
  return stat(name.data(), &status) == 0 && status.st_size > 0;
}

}  // namespace

StoredValues storedValues(const char* path) {
  struct stat status {};
  if (stat(path, &status) != 0) {
    return errno == ENOENT ? StoredValues::kNone : StoredValues::kUnknown;
  }
  if (status.st_size == 0) return StoredValues::kNone;

  int descriptor = openDescriptorOn(status);
  // What a crash left is rolled back by whoever opens the store.
  if (descriptor < 0 && hasContent(path, "-journal")) return StoredValues::kUnknown;
  if (descriptor < 0) descriptor = open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC);
  if (descriptor < 0) return StoredValues::kUnknown;

  StoreFile file(descriptor);
  const StoredValues found = file.values();
  const bool isElsewhere = file.isWal() && hasContent(path, "-wal");
  return found == StoredValues::kNone && isElsewhere ? StoredValues::kUnknown : found;
}

}  // namespace keldcore
