// Authorization requests that an application pushes beforehand (RFC 9126), so
// that the user's browser carries no more than a reference.
//
// Such a request waits among the codes for a minute. The first time that it is
// opened it gets the time that a user needs to sign in and to read a page, and
// until then it can be opened again: people reload pages. The code that is
// issued for it (CodeRequest::pushed) ends it. It cannot be redeemed, is nobody's
// access and is not listed, and goes with its application. Only the digest of
// its reference is stored; its text stands there as it is.

#ifndef KELDOAUTH_GRANTS_PUSHED_H
#define KELDOAUTH_GRANTS_PUSHED_H

#include "grants/outcome.h"
#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants {

class Store;

struct PushRequest {
  ApplicationId application;  // authenticated
  RequestText text;
  PeerAddress from = {};
};

struct Pushed {
  RequestReference reference;  // told this once
  long long expires;           // Unix seconds; it is to be opened before this one
};

/// Each throws Trouble.
class PushedRequests {
 public:
  explicit PushedRequests(Store& store) : store_(store) {}

  /// Refusals: kInvalidRequest, kInvalidClient. Beyond the policy's bound the
  /// application's oldest request goes. Trouble: kFull, also when the requests
  /// of other applications have taken the part of the table that all of them
  /// have together.
  Outcome<Pushed> push(const PushRequest& request);

  /// What was pushed. Refusals: kInvalidClient; kInvalidRequestUri for a
  /// reference that is unknown, expired, used or another application's.
  Outcome<RequestText> open(const ApplicationId& application, const RequestReference& reference);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_PUSHED_H
