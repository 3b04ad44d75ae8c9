#include "engines/postgresql/statement.h"

#include <cstddef>
#include <initializer_list>

#include "engines/postgresql/expression.h"
#include "engines/postgresql/tokens.h"

namespace keldoauth::postgresql {
namespace {

using Kind = Statement::Kind;
using Tokens = std::vector<Token>;

bool startsWith(const Tokens& tokens, std::initializer_list<std::string_view> words,
                std::size_t at = 0) {
  for (const std::string_view word : words) {
    if (at >= tokens.size() || !tokens[at++].isWord(word)) return false;
  }
  return true;
}

const Token& tokenAt(const Tokens& tokens, std::size_t at) {
  static const Token kNothing{Token::Kind::kEnd, ""};
  return at < tokens.size() ? tokens[at] : kNothing;
}

bool isNamed(const Token& token) {
  return token.kind == Token::Kind::kWord || token.kind == Token::Kind::kName;
}

// Tables ----------------------------------------------------------------------------

/// One column's or constraint's words: SQLite's integers have 64 bits, and its
/// texts are compared byte by byte.
std::string columnWord(const Token& token) {
  if (token.isWord("INTEGER")) return "bigint";
  if (token.isWord("TEXT")) return "text COLLATE \"C\"";
  for (const std::string_view word : {"NOT", "NULL", "UNIQUE", "PRIMARY", "KEY", "DEFAULT"}) {
    if (token.isWord(word)) return std::string(word);
  }
  return isNamed(token) ? quotedName(token.text) : std::string(token.text);
}

std::string textLiteral(std::string_view text) {
  std::string literal = "'";
  for (const char c : text) literal.append(c == '\'' ? 2 : 1, c);
  return literal + "'";
}

/// SQLite gives a row the next id where none is given, which a trigger does
/// here. The name as it was spelt stands with the table, for the catalogue.
Statement creation(const Tokens& tokens) {
  const bool mayExist = startsWith(tokens, {"IF", "NOT", "EXISTS"}, 2);
  const std::size_t at = mayExist ? 5 : 2;
  const Token& name = tokenAt(tokens, at);
  if (!isNamed(name) || !tokenAt(tokens, at + 1).isSign("(")) {
    throw Refusal{syntaxError(isNamed(name) ? tokenAt(tokens, at + 1).text : name.text)};
  }
  const std::string table = kSchema + quotedName(name.text);
  std::string sql = std::string("CREATE TABLE ") + (mayExist ? "IF NOT EXISTS " : "") + table;
  bool hasId = false;
  for (std::size_t i = at + 1; i < tokens.size(); ++i) {
    hasId = hasId || (tokens[i].isWord("ID") && startsWith(tokens, {"INTEGER", "PRIMARY"}, i + 1));
    sql += " " + columnWord(tokens[i]);
  }
  sql += ";COMMENT ON TABLE " + table + " IS " + textLiteral(name.text);
  if (hasId) {
    sql += ";CREATE OR REPLACE TRIGGER sqlite_id BEFORE INSERT ON " + table +
           " FOR EACH ROW WHEN (NEW.id IS NULL) EXECUTE FUNCTION " + kSchema + "sqlite_next_id()";
  }
  return {mayExist ? Kind::kCreateIfAbsent : Kind::kCreate, sql, std::string(name.text)};
}

Statement removal(const Tokens& tokens) {
  const bool mayLack = startsWith(tokens, {"IF", "EXISTS"}, 2);
  const Token& name = tokenAt(tokens, mayLack ? 4 : 2);
  if (!isNamed(name)) throw Refusal{syntaxError(name.text)};
  return {
      Kind::kWrite,
      std::string("DROP TABLE ") + (mayLack ? "IF EXISTS " : "") + kSchema + quotedName(name.text),
      std::string(name.text)};
}

// Rows ------------------------------------------------------------------------------

std::string tableOf(const Tokens& tokens) {
  for (std::size_t i = 0; i + 1 < tokens.size(); ++i) {
    for (const std::string_view word : {"FROM", "INTO", "UPDATE"}) {
      if (tokens[i].isWord(word) && isNamed(tokens[i + 1])) return std::string(tokens[i + 1].text);
    }
  }
  return {};
}

bool asksForChanges(const Tokens& tokens) {
  return tokens.size() == 4 && startsWith(tokens, {"SELECT", "CHANGES"}) && tokens[2].isSign("(") &&
         tokens[3].isSign(")");
}

Statement understood(const Tokens& tokens) {
  if (startsWith(tokens, {"BEGIN", "IMMEDIATE"}) || startsWith(tokens, {"BEGIN", "EXCLUSIVE"})) {
    return {Kind::kBeginImmediate, {}, {}};
  }
  if (startsWith(tokens, {"BEGIN"})) return {Kind::kBegin, {}, {}};
  if (startsWith(tokens, {"COMMIT"}) || startsWith(tokens, {"END"})) return {Kind::kCommit, {}, {}};
  if (startsWith(tokens, {"ROLLBACK"})) return {Kind::kRollback, {}, {}};
  if (startsWith(tokens, {"PRAGMA"})) return {Kind::kPragma, {}, {}};
  if (asksForChanges(tokens)) return {Kind::kChanges, {}, {}};
  if (startsWith(tokens, {"CREATE", "TABLE"})) return creation(tokens);
  if (startsWith(tokens, {"DROP", "TABLE"})) return removal(tokens);
  if (startsWith(tokens, {"SELECT"})) return {Kind::kRead, rewritten(tokens), tableOf(tokens)};
  for (const std::string_view word : {"INSERT", "UPDATE", "DELETE"}) {
    if (startsWith(tokens, {word})) return {Kind::kWrite, rewritten(tokens), tableOf(tokens)};
  }
  throw Refusal{syntaxError(tokens.front().text)};
}

Statement statementOf(const Tokens& tokens) try {
  for (const Token& token : tokens) {
    if (token.kind != Token::Kind::kRefused) continue;
    throw Refusal{"unrecognized token: \"" + std::string(token.text) + "\""};
  }
  return understood(tokens);
} catch (const Refusal& refusal) {
  return {Kind::kRefused, refusal.reason, {}};
}

}  // namespace

std::vector<Statement> statementsOf(std::string_view sql) {
  std::vector<Statement> statements;
  Tokens one;
  for (const Token& token : tokensOf(sql)) {
    if (token.kind != Token::Kind::kEnd) {
      one.push_back(token);
      continue;
    }
    if (!one.empty()) statements.push_back(statementOf(one));
    if (!statements.empty() && statements.back().kind == Kind::kRefused) return statements;
    one.clear();
  }
  if (!one.empty()) statements.push_back(statementOf(one));
  return statements;
}

}  // namespace keldoauth::postgresql
