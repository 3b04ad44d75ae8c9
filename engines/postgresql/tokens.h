// The words of a statement, as SQLite reads them.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_TOKENS_H
#define KELDOAUTH_ENGINES_POSTGRESQL_TOKENS_H

#include <string>
#include <string_view>
#include <vector>

namespace keldoauth::postgresql {

struct Token {
  enum class Kind {
    kWord,     // a keyword, or a name without quotes
    kName,     // a name within quotes, which are not part of the text
    kText,     // a literal, quotes included
    kNumber,   // a whole number
    kSign,     // what is left: operators, parentheses, commas, asterisks
    kEnd,      // of a statement: a semicolon
    kRefused,  // what SQLite does not know, to the end of the text
  };

  Kind kind;
  std::string_view text;

  /// Whether it is this keyword, given in capitals.
  [[nodiscard]] bool isWord(std::string_view capitals) const;
  [[nodiscard]] bool isSign(std::string_view sign) const;
};

/// Letters of ASCII alone change; all other bytes stay.
std::string lowered(std::string_view text);

/// They refer to `sql`, which must outlive them. Nothing follows a token that is
/// refused.
std::vector<Token> tokensOf(std::string_view sql);

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_TOKENS_H
