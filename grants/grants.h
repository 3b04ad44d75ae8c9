// Whole operations over the stores: what a service or an administrator does,
// each one transaction or one statement, on one connection.
//
//   Grants grants;
//   auto code = grants.codes.issue({User("alice"), id, Scope("photos"), address});
//   auto pair = grants.codes.redeem({id, code->code, address});
//   auto bearer = grants.tokens.verify(pair->access);
//
// Rules that hold for every operation:
// - Whole or not at all: killed, or the power cut, at any point, either nothing
//   has happened or everything has.
// - What a request did wrong is a value (grants/outcome.h). What the store could
//   not do is an exception (grants/trouble.h). Nothing else is thrown, but for
//   a std::exception of another kind when memory runs out.
// - Texts go in and come out as they are (grants/texts.h).
// - At rest there is no usable code or token: the file holds digests.
// - Nobody can push others out (grants/policy.h).

#ifndef KELDOAUTH_GRANTS_GRANTS_H
#define KELDOAUTH_GRANTS_GRANTS_H

#include <memory>

#include "grants/access.h"
#include "grants/applications.h"
#include "grants/audit.h"
#include "grants/codes.h"
#include "grants/outcome.h"
#include "grants/policy.h"
#include "grants/pushed.h"
#include "grants/room.h"
#include "grants/texts.h"
#include "grants/tokens.h"
#include "grants/trouble.h"

namespace KELDOAUTHSERVER::grants {

/// One connection for its whole life and for any number of operations, one
/// after the other. It belongs to one thread at a time; constructing and
/// destroying switches the ids of the whole process, as with every store.
class Grants {
 private:
  std::unique_ptr<Store> store_;

 public:
  /// Opens the store, and creates it when there is none. Throws Trouble when it
  /// is not ready (kNotReady, kLocked, kMedium). There is no reopen: after a
  /// file was replaced, construct another.
  explicit Grants(const Policy& policy = {});
  ~Grants();
  Grants(const Grants&) = delete;
  Grants& operator=(const Grants&) = delete;

  Applications applications;
  Codes codes;
  PushedRequests pushed;
  Tokens tokens;
  Access access;
  Room room;
  Audit audit;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_GRANTS_H
