#include "engines/postgresql/tokens.h"

#include <algorithm>
#include <cstddef>
#include <iterator>

namespace keldoauth::postgresql {
namespace {

char lower(char c) {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

/// SQLite takes every byte beyond ASCII for a letter.
bool isLetter(char c) {
  const char small = lower(c);
  return (small >= 'a' && small <= 'z') || c == '_' || static_cast<unsigned char>(c) >= 0x80;
}

bool isBlank(char c) {
  return c == ' ' || (c >= '\t' && c <= '\r' && c != '\v');
}

class Lexer {
 public:
  explicit Lexer(std::string_view sql) : left_(sql) {}

  std::vector<Token> tokens() {
    std::vector<Token> all;
    while (skipBlanks()) {
      all.push_back(next());
      if (all.back().kind == Token::Kind::kRefused) break;
    }
    return all;
  }

 private:
  /// Comments are blanks. False at the end.
  bool skipBlanks() {
    while (!left_.empty()) {
      if (isBlank(left_.front())) {
        left_.remove_prefix(1);
      } else if (left_.substr(0, 2) == "--") {
        left_.remove_prefix(std::min(left_.find('\n'), left_.size()));
      } else if (left_.substr(0, 2) == "/*") {
        const std::size_t end = left_.find("*/", 2);
        left_.remove_prefix(end == std::string_view::npos ? left_.size() : end + 2);
      } else {
        return true;
      }
    }
    return false;
  }

  Token next() {
    const char c = left_.front();
    if (c == ';') return take(Token::Kind::kEnd, 1);
    if (c == '\'') return takeText();
    if (c == '"' || c == '`' || c == '[') return takeName(c == '[' ? ']' : c);
    if (isLetter(c)) {
      return takeWhile(Token::Kind::kWord,
                       [](char d) { return isLetter(d) || isDigit(d) || d == '$'; });
    }
    if (isDigit(c)) return takeNumber();
    return takeSign();
  }

  Token take(Token::Kind kind, std::size_t size) {
    const Token token{kind, left_.substr(0, size)};
    left_.remove_prefix(token.text.size());
    return token;
  }

  template <typename Predicate>
  Token takeWhile(Token::Kind kind, Predicate isPart) {
    const auto* const end = std::find_if_not(left_.begin(), left_.end(), isPart);
    return take(kind, static_cast<std::size_t>(std::distance(left_.begin(), end)));
  }

  Token refuse() { return take(Token::Kind::kRefused, left_.size()); }

  /// Just behind the quote that ends what begins here; a doubled one ends
  /// nothing. npos when there is none.
  [[nodiscard]] std::size_t closing(char quote) const {
    for (std::size_t i = 1; i < left_.size(); ++i) {
      if (left_[i] != quote) continue;
      if (i + 1 >= left_.size() || left_[i + 1] != quote) return i + 1;
      ++i;
    }
    return std::string_view::npos;
  }

  Token takeText() {
    const std::size_t end = closing('\'');
    return end == std::string_view::npos ? refuse() : take(Token::Kind::kText, end);
  }

  /// A quote within a name would have to be undone: no name of a store has one.
  Token takeName(char quote) {
    const std::size_t end = left_.find(quote, 1);
    if (end == std::string_view::npos) return refuse();
    Token name = take(Token::Kind::kName, end + 1);
    name.text = name.text.substr(1, end - 1);
    return name;
  }

  Token takeNumber() {
    const Token number = takeWhile(Token::Kind::kNumber, isDigit);
    return left_.empty() || !isLetter(left_.front()) ? number : refuse();
  }

  Token takeSign() {
    constexpr std::string_view kSigns[] = {"||", "<=", ">=", "<>", "!=", "==", "=", "<", ">",
                                           "(",  ")",  ",",  ".",  "*",  "+",  "-", "/", "%"};
    for (const std::string_view sign : kSigns) {
      if (left_.substr(0, sign.size()) == sign) return take(Token::Kind::kSign, sign.size());
    }
    return refuse();
  }

  std::string_view left_;
};

}  // namespace

bool Token::isWord(std::string_view capitals) const {
  return kind == Kind::kWord &&
         std::equal(text.begin(), text.end(), capitals.begin(), capitals.end(),
                    [](char a, char b) { return lower(a) == lower(b); });
}

bool Token::isSign(std::string_view sign) const {
  return kind == Kind::kSign && text == sign;
}

std::string lowered(std::string_view text) {
  std::string low(text);
  std::transform(low.begin(), low.end(), low.begin(), lower);
  return low;
}

std::vector<Token> tokensOf(std::string_view sql) {
  return Lexer(sql).tokens();
}

}  // namespace keldoauth::postgresql
