// A statement of the stores, and what the server is asked in its place.
//
// This is no translator of SQL. It knows the statements that the core and the
// floor above the stores write, with whatever conditions callers give them; what
// it does not know is refused, never guessed.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_STATEMENT_H
#define KELDOAUTH_ENGINES_POSTGRESQL_STATEMENT_H

#include <string>
#include <string_view>
#include <vector>

namespace keldoauth::postgresql {

struct Statement {
  enum class Kind {
    kBegin,
    kBeginImmediate,
    kCommit,
    kRollback,
    kPragma,   // how SQLite treats its file: nothing to do
    kChanges,  // SELECT changes(), which the connection knows by itself
    kCreate,
    kCreateIfAbsent,
    kWrite,
    kRead,
    kRefused,
  };

  Kind kind;
  std::string text;   // for the server; of one that is refused, why
  std::string table;  // as the statement spells it; may be empty
};

/// The statements of a text, in order. None follows one that is refused.
std::vector<Statement> statementsOf(std::string_view sql);

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_STATEMENT_H
