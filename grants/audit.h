// The audit log: who changed who may do what.
//
// An entry reads
//
//   Application disabled[Photo Frame 1a2b3c4d] by [bob]
//   Access ended[Photo Frame 1a2b3c4d] for [alice] by [bob] (3 times)
//
// with the first eight characters of the application's identifier. Texts that
// come from outside are made harmless: "[" and "]" become "(" and ")", and
// whatever is not shown, or turns the direction of what is (control, format and
// bidirectional characters, bytes that are not UTF-8), becomes "\x1b" or
// "\u{202e}". So no name can end its brackets or stand for another entry.
//
// Operations write their entries themselves; what else changes who may do what
// is recorded here.

#ifndef KELDOAUTH_GRANTS_AUDIT_H
#define KELDOAUTH_GRANTS_AUDIT_H

#include <optional>
#include <string>
#include <vector>

#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants {

class Store;

struct AuditEntry {
  long long row;
  long long time;  // Unix seconds, of the first time it happened
  std::string text;
};

struct AuditFilter {
  std::string contains = {};            // "%" stands for any text, "_" for any character
  std::optional<long long> since = {};  // Unix seconds, included
  std::optional<long long> until = {};  // likewise
  int most = 1000;
  int skipped = 0;  // the newest so many are left out
};

/// Each throws Trouble.
class Audit {
 public:
  explicit Audit(Store& store) : store_(store) {}

  /// Newest first.
  [[nodiscard]] std::vector<AuditEntry> list(const AuditFilter& filter) const;

  /// For what happens outside this floor, such as "Database restored": `what`
  /// is the caller's own word, 1 to 64 bytes. The same entry within the
  /// policy's pause is counted, not repeated.
  void record(const std::string& what, const Actor& by);

  /// Empties the log but for the entry that says so. How many went.
  long long clear(const Actor& by);

 private:
  Store& store_;
};

/// `text` as an entry shows it.
std::string harmless(const std::string& text);

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_AUDIT_H
