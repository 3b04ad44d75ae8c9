// The small world in which the fuzz targets let the library work: its database
// in memory, a fixed clock, a cipher that can be read. Beside it stands a second
// database on which a target carries out, with bound parameters instead of SQL
// text, what the library was asked for. Both must hold the same afterwards.

#ifndef KELDOAUTH_TESTS_FUZZ_WORLD_H
#define KELDOAUTH_TESTS_FUZZ_WORLD_H

#include <json/value.h>
#include <sqlite3.h>

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tests/fuzz/expect.h"

namespace fuzz {

/// The second in which everything happens.
constexpr long long kNow = 1700000000;

using Row = std::map<std::string, std::string>;

/// A connection of the target's own.
class Database {
 public:
  explicit Database(const char* path);
  ~Database();
  Database(const Database&) = delete;
  Database& operator=(const Database&) = delete;

  struct Effect {
    bool ok = false;
    int changes = 0;
    std::vector<Row> rows;  // NULL reads as the empty text
  };
  /// Runs one statement with `texts` in the place of its question marks.
  Effect run(const std::string& sql, const std::vector<std::string>& texts = {});
  void runAll(const char* statements);

  /// Every row of every table. Read again only when something was committed.
  const std::string& dump();

 private:
  void prepare(const char* sql, sqlite3_stmt*& statement);
  long long changeMark();

  sqlite3* db_ = nullptr;
  sqlite3_stmt* everything_ = nullptr;
  sqlite3_stmt* version_ = nullptr;
  long long dumpedAt_ = -1;
  std::string dump_;
};

/// The world itself; made by the first call.
class World {
 public:
  static World& instance();

  /// A few rows in each table, the same ones every time.
  void startOver();

  /// Ends the program unless both databases hold the same.
  void expectAgreement(const char* operation);

  /// The one with bound parameters.
  Database& model() { return model_; }

 private:
  World();

  Database library_;
  Database model_;
  std::string furnished_;
};

/// What the platform's cipher makes of a text; nothing when it refuses it.
std::optional<std::string> encrypted(const std::string& text);
/// The inverse.
std::optional<std::string> decrypted(const std::string& text);

/// The text up to its first NUL byte.
std::string upToNul(const std::string& text);
/// The text with its single quotes doubled.
std::string doubled(const std::string& text);

/// What a reader of rows sees: client identifiers and secrets in the clear.
Json::Value asResult(const std::vector<Row>& rows);

/// Splits an input: single bytes for choices, then texts. A text ends with the
/// byte 1e; the byte 1d stands before a byte that is meant as it is.
class Input {
 public:
  Input(const std::uint8_t* data, std::size_t size) : at_(data), end_(data + size) {}

  /// A number below `limit`.
  unsigned choice(unsigned limit);
  std::string text();
  /// All that is left, as it stands.
  [[nodiscard]] std::string_view rest() const;

 private:
  const std::uint8_t* at_;
  const std::uint8_t* end_;
};

}  // namespace fuzz

#endif  // KELDOAUTH_TESTS_FUZZ_WORLD_H
