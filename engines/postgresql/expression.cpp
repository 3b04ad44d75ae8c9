#include "engines/postgresql/expression.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <utility>

namespace keldoauth::postgresql {
namespace {

using Kind = Token::Kind;

constexpr std::string_view kKeywords[] = {
    "ALL",  "AND",  "AS",     "ASC",    "BETWEEN", "BY",     "CASE", "DELETE", "DESC",  "DISTINCT",
    "ELSE", "END",  "EXISTS", "FROM",   "GROUP",   "HAVING", "IN",   "INSERT", "INTO",  "IS",
    "JOIN", "LEFT", "LIMIT",  "NOT",    "NULL",    "OFFSET", "ON",   "OR",     "ORDER", "SELECT",
    "SET",  "THEN", "UNION",  "UPDATE", "VALUES",  "WHEN",   "WHERE"};

/// SQLite's functions, and the server's in their place.
struct Function {
  std::string_view name;
  std::string_view inPlace;
  bool isOurs;  // stands in our schema
};

constexpr Function kFunctions[] = {{"COUNT", "count", false},
                                   {"MAX", "max", false},
                                   {"MIN", "min", false},
                                   {"IFNULL", "coalesce", false},
                                   {"COALESCE", "coalesce", false},
                                   {"SUM", "sqlite_sum", true},
                                   {"SUBSTR", "sqlite_substr", true},
                                   {"INSTR", "sqlite_instr", true},
                                   {"LENGTH", "sqlite_length", true},
                                   {"LOWER", "lower", false},
                                   {"STRFTIME", "sqlite_strftime", true}};

/// The columns of the stores that hold numbers.
constexpr std::string_view kNumberColumns[] = {"ID", "TIMESTAMP", "VERSION"};

/// Tables without the column by which rows are ordered.
constexpr std::string_view kTablesWithoutId[] = {"OAUTH_META", "SQLITE_MASTER"};

template <std::size_t size>
bool isOneOf(const Token& token, const std::string_view (&words)[size]) {
  return std::any_of(std::begin(words), std::end(words),
                     [&](std::string_view word) { return token.isWord(word); });
}

/// A literal that SQLite takes for a whole number where a number stands beside
/// it: its text without quotes, and nothing for any other.
std::string numberIn(const Token& literal) {
  std::string_view text = literal.text.substr(1, literal.text.size() - 2);
  const bool isNegative = !text.empty() && text.front() == '-';
  if (isNegative) text.remove_prefix(1);
  const bool isNumber = !text.empty() && text.find_first_not_of("0123456789") == text.npos;
  return isNumber ? (isNegative ? "-" : "") + std::string(text) : "";
}

class Rewriter {
 public:
  explicit Rewriter(const std::vector<Token>& tokens) : tokens_(tokens) {}

  std::string text() {
    noteSubject();
    while (at_ < tokens_.size()) {
      if (depth_ == 0 && token().isWord("LIMIT")) completeOrder();
      if (depth_ == 0 && token().isWord("ORDER")) hasOrder_ = true;
      rewriteOne();
    }
    completeOrder();
    return std::move(out_);
  }

 private:
  [[nodiscard]] const Token& token(std::size_t ahead = 0) const {
    static const Token kNothing{Kind::kEnd, ""};
    return at_ + ahead < tokens_.size() ? tokens_[at_ + ahead] : kNothing;
  }
  [[nodiscard]] const Token& before() const {
    static const Token kNothing{Kind::kEnd, ""};
    return at_ > 0 ? tokens_[at_ - 1] : kNothing;
  }

  void write(std::string_view word) {
    if (!out_.empty()) out_ += ' ';
    out_ += word;
  }

  void skip(std::size_t count = 1) { at_ += count; }

  /// Rows come in the order of their ids, as SQLite finds them, unless the
  /// statement says otherwise; where it leaves a tie, too.
  void noteSubject() {
    isWholeRows_ = token().isWord("SELECT") && token(1).isSign("*") && token(2).isWord("FROM") &&
                   !token(3).isSign("(") && !isOneOf(token(3), kTablesWithoutId);
  }

  void completeOrder() {
    if (!isWholeRows_) return;
    write(hasOrder_ ? ", \"id\"" : "ORDER BY \"id\"");
    isWholeRows_ = false;
  }

  void rewriteOne() {
    switch (token().kind) {
      case Kind::kWord:
        return rewriteWord();
      case Kind::kName:
        return rewriteName();
      case Kind::kText:
        return rewriteText();
      case Kind::kNumber:
        return rewriteNumber();
      case Kind::kSign:
        return rewriteSign();
      case Kind::kEnd:
      case Kind::kRefused:
        break;
    }
    throw Refusal{syntaxError(token().text)};
  }

  // Words -----------------------------------------------------------------------

  void rewriteWord() {
    if (token().isWord("CAST")) return rewriteCast();
    if (token().isWord("LIKE")) return rewriteLike("~*", 1);
    if (token().isWord("NOT") && token(1).isWord("LIKE")) return rewriteLike("!~*", 2);
    if (token().isWord("LIMIT")) return rewriteLimit();
    if (token().isWord("AS")) return rewriteAs();
    if (!isOneOf(token(), kKeywords)) return rewriteName();
    noteWord();
    write(token().text);
    skip();
  }

  void noteWord() {
    if (token().isWord("SET")) isWithinSet_ = true;
    if (token().isWord("WHERE")) isWithinSet_ = false;
    if (token().isWord("BETWEEN")) isBetween_ = true;
    if (token().isWord("AND") && std::exchange(isBetween_, false)) boundOfBetween_ = at_ + 1;
  }

  void rewriteName() {
    const bool isTable =
        before().isWord("FROM") || before().isWord("INTO") || before().isWord("UPDATE");
    if (!isTable && token().kind == Kind::kWord && token(1).isSign("(")) return rewriteFunction();
    // SQLite's own name for the number of a row, which is in that column.
    const std::string_view name = token().isWord("ROWID") ? "id" : token().text;
    write((isTable ? kSchema : "") + quotedName(name));
    skip();
  }

  void rewriteFunction() {
    const auto* const found =
        std::find_if(std::begin(kFunctions), std::end(kFunctions),
                     [this](const Function& function) { return token().isWord(function.name); });
    if (found == std::end(kFunctions)) {
      throw Refusal{"no such function: " + std::string(token().text)};
    }
    write((found->isOurs ? kSchema : "") + std::string(found->inPlace));
    skip();
  }

  /// CAST(x AS INTEGER) is a function of x; its end is found by rewriteAs.
  void rewriteCast() {
    if (!token(1).isSign("(")) throw Refusal{syntaxError(token().text)};
    write(std::string(kSchema) + "sqlite_integer");
    skip();
  }

  /// What is no end of a CAST gives a name to what stands before it.
  void rewriteAs() {
    if (token(1).isWord("INTEGER") && token(2).isSign(")")) return skip(2);
    write("AS");
    skip();
  }

  void rewriteLike(std::string_view sign, std::size_t words) {
    const Token& pattern = token(words);
    if (pattern.kind != Kind::kText) throw Refusal{syntaxError(pattern.text)};
    write(std::string(sign) + " " + kSchema + "sqlite_like(" + std::string(pattern.text) + ")");
    skip(words + 1);
  }

  /// A negative limit is none.
  void rewriteLimit() {
    write("LIMIT");
    skip();
    if (!token().isSign("-")) return;
    write("ALL");
    skip(2);
  }

  // Values ----------------------------------------------------------------------

  /// SQLite compares a column of numbers with a literal as numbers when the
  /// literal is one; another is equal to none of them.
  void rewriteText() {
    const bool isCompared = !isWithinSet_ && before().isSign("=") && at_ >= 2 &&
                            isOneOf(tokens_[at_ - 2], kNumberColumns);
    if (isCompared) {
      const std::string number = numberIn(token());
      write(number.empty() ? "NULL" : number);
    } else {
      write(token().text);
    }
    skip();
  }

  /// A number that stands for a condition.
  void rewriteNumber() {
    constexpr std::string_view kBefore[] = {"WHERE", "WHEN", "ON", "NOT", "OR", "AND"};
    constexpr std::string_view kBehind[] = {"OR", "AND", "THEN", "ORDER", "LIMIT"};
    const bool goesOn = isOneOf(token(1), kBehind);
    const bool isFirst = isOneOf(before(), kBefore) || (before().isSign("(") && goesOn);
    const bool isLast = token(1).kind == Kind::kEnd || token(1).isSign(")") || goesOn;
    write(isFirst && isLast && at_ != boundOfBetween_ ? "(" + std::string(token().text) + "<>0)"
                                                      : token().text);
    skip();
  }

  void rewriteSign() {
    if (token().isSign("(")) ++depth_;
    if (token().isSign(")")) --depth_;
    write(token().isSign("==") ? "=" : token().text);
    skip();
  }

  const std::vector<Token>& tokens_;
  std::size_t at_ = 0;
  int depth_ = 0;
  bool isWholeRows_ = false;
  bool hasOrder_ = false;
  bool isBetween_ = false;
  std::size_t boundOfBetween_ = 0;  // where the last one's second bound begins
  bool isWithinSet_ = false;
  std::string out_;
};

}  // namespace

std::string quotedName(std::string_view name) {
  std::string quoted = "\"";
  for (const char c : lowered(name)) {
    quoted += c;
    if (c == '"') quoted += c;
  }
  return quoted + "\"";
}

std::string syntaxError(std::string_view at) {
  if (at.empty()) return "incomplete input";
  return "near \"" + std::string(at) + "\": syntax error";
}

std::string rewritten(const std::vector<Token>& tokens) {
  return Rewriter(tokens).text();
}

}  // namespace keldoauth::postgresql
