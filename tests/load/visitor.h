// The life of one web-facing program: round after round of everything that a
// login takes, with store objects that live as long as one request.

#ifndef KELDOAUTH_TESTS_LOAD_VISITOR_H
#define KELDOAUTH_TESTS_LOAD_VISITOR_H

#include <string>

#include "core/oauth_db_basic.h"
#include "tests/load/ledger.h"

namespace load {

class Visitor {
 public:
  /// `number` tells the visitors apart. A purge that finds a row which another
  /// purge removed in the meantime reports failure without an error code, so
  /// that only one of them purges, as one job of the box would.
  Visitor(int number, bool purges) : number_(number), purges_(purges) {}

  void visit(int rounds);

  [[nodiscard]] const Ledger& ledger() const { return ledger_; }

 private:
  void registerClient();
  void redeemCode();
  void useTokens();
  void leaveExpired();
  void purge();

  bool took(const char* call, const KELDOAUTHSERVER::OAUTHDBBasic& store, bool success);
  [[nodiscard]] std::string name() const;

  int number_;
  bool purges_;
  int round_ = 0;
  Ledger ledger_;
};

}  // namespace load

#endif  // KELDOAUTH_TESTS_LOAD_VISITOR_H
