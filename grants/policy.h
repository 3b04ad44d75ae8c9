// How much of the store one user or application may take, and how long things
// last. The defaults are what a box of a household or a small firm needs.

#ifndef KELDOAUTH_GRANTS_POLICY_H
#define KELDOAUTH_GRANTS_POLICY_H

namespace KELDOAUTHSERVER::grants {

/// Rows are counted against the settings' limit of their table. Beyond a bound
/// what is dead goes first, then what the same user or application renewed
/// longest ago, in the transaction of the operation that needs the place.
/// Nothing of anybody else's goes, ever. A bound below 1 counts as 1.
struct Policy {
  // Rows --------------------------------------------------------------------

  int codesOfOne = 3;       // live codes of one user for one application
  int sessionsOfOne = 8;    // logins of one user with one application
  int tokensOfItself = 32;  // live tokens of one application that acts for itself
  int pushedOfOne = 32;     // live pushed requests of one application

  // Shares of a table, as one part in so many.

  int userPart = 4;            // one user: a quarter of the codes, of the tokens;
                               // as much for the own tokens of all applications
                               // that registered themselves together, and for
                               // the pushed requests of all applications
  int applicationPart = 2;     // one application: half of them
  int selfRegisteredPart = 2;  // applications that registered themselves: half
                               // of the registry

  // Seconds: 0 to a hundred years; a number outside counts as the nearest ---

  /// A login that nobody refreshed for so long after its access token expired
  /// is dead.
  long long idle = 30LL * 24 * 60 * 60;
  /// A login ends so long after its code was issued, however often refreshed.
  long long family = 365LL * 24 * 60 * 60;
  /// A code or refresh token that comes again so soon is a client that tried
  /// twice. Counted from the use: a clock that was set back gives none.
  long long grace = 10;
  /// A pushed request can be opened so long, and once it was, for so long again.
  long long pushed = 60;
  long long pushedOpen = 10LL * 60;
  /// The same entry of the audit log within so long is counted, not repeated.
  long long auditPause = 60LL * 60;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_POLICY_H
