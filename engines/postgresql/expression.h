// The words of a statement that reads or changes rows, rewritten for the server.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_EXPRESSION_H
#define KELDOAUTH_ENGINES_POSTGRESQL_EXPRESSION_H

#include <string>
#include <string_view>
#include <vector>

#include "engines/postgresql/tokens.h"

namespace keldoauth::postgresql {

/// Everything of ours on the server stands in a schema of this name, and is
/// called by its full name: no search path can put something else in its place.
inline constexpr char kSchema[] = "keldoauth.";

/// A name as the server has it: SQLite does not look at capitals.
std::string quotedName(std::string_view name);

/// SQLite's words for a statement that it does not understand.
std::string syntaxError(std::string_view at);

/// Why a statement is not understood, in SQLite's words.
struct Refusal {
  std::string reason;
};

/// Throws Refusal.
std::string rewritten(const std::vector<Token>& tokens);

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_EXPRESSION_H
