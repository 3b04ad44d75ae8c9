// Who has access to what, and ending it.

#ifndef KELDOAUTH_GRANTS_ACCESS_H
#define KELDOAUTH_GRANTS_ACCESS_H

#include <optional>
#include <string>
#include <vector>

#include "grants/outcome.h"
#include "grants/slice.h"
#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants {

class Store;

/// Names one code, login or own token as it was read. The row's id alone names
/// nothing: ids are given out again.
struct AccessHandle {
  enum class Table { kCodes, kTokens };
  Table table;
  long long row;
  std::string mark;  // a digest of what the row held: no use to anybody else
};

/// One row. Rows of other programs are here, too.
struct AccessEntry {
  enum class Kind {
    kCode,   // agreed to, not logged in yet
    kSpent,  // a code that was redeemed; remembered in case it comes again
    kLogin,  // a pair of tokens
    kOwn,    // a token of an application that acts for itself
  };
  AccessHandle handle;
  Kind kind;
  std::optional<User> user;  // none for kOwn
  ApplicationId application;
  /// None when the application is not registered any more.
  std::optional<ApplicationName> applicationName;
  Scope scope;        // of the login
  long long since;    // Unix seconds: of the login; 0 when not known
  long long renewed;  // when the present tokens were issued, as near as the
                      // file comes to "last used"; 0 likewise
  long long expires;  // of the access token or the code
  long long ends;     // when it is dead if nobody uses it: until then a login
                      // can be refreshed
  PeerAddress from;   // of the last request that renewed it
  std::string flow;   // "authorization_code", "client_credentials"; empty for a code
  CallerText text;    // of other programs' rows: their state
  bool isDead;        // no good any more; a login whose year is over stays until
                      // it would be dead unused, and then goes with a purge
  bool isForeign;     // stored by another program, in the clear
};

/// What is absent does not narrow.
struct AccessFilter {
  std::optional<User> user = {};
  std::optional<ApplicationId> application = {};
  bool withDead = false;   // also what is dead
  bool withSpent = false;  // also codes that were redeemed
  /// A part of the user's or the application's name, upper and lower case of
  /// ASCII taken for the same. Of a name with quotes that another program's Edit
  /// stored as given, what stands before or behind them.
  std::string contains = {};
};

/// Which of the two an operation is about. Codes alone are those that were not
/// redeemed yet: the others have to be known if they come again.
enum class Rows { kAll, kCodes, kTokens };

struct Ended {
  int codes;   // that were not redeemed yet
  int tokens;  // logins and own tokens
};

/// Each throws Trouble. What ends something leaves one audit entry when there
/// was something to end.
class Access {
 public:
  explicit Access(Store& store) : store_(store) {}

  /// In the order of the rows, codes first. A filter with a user leaves out
  /// what applications have for themselves. All of it at one moment.
  [[nodiscard]] std::vector<AccessEntry> list(const AccessFilter& filter) const;

  /// A part of the same.
  [[nodiscard]] Sliced<AccessEntry> page(const AccessFilter& filter, const Slice& slice = {}) const;

  /// The entry that a code or token belongs to, dead or not.
  [[nodiscard]] std::optional<AccessEntry> find(const Code& code) const;
  [[nodiscard]] std::optional<AccessEntry> find(const AnyToken& token) const;

  /// Whether the user has a login with the application that can still be
  /// refreshed and covers the scope: what they agreed to once, however it was
  /// narrowed since. Codes, own tokens and other programs' rows do not count.
  /// Of a code that is issued for it see CodeRequest::withoutPage.
  [[nodiscard]] bool hasLogin(const User& user, const ApplicationId& application,
                              const Scope& scope) const;

  /// What the handle named, if it is still as it was read; else nothing.
  Ended end(const AccessHandle& handle, const Actor& by);

  /// Several in one transaction; those that are not as they were are left out.
  Ended end(const std::vector<AccessHandle>& handles, const Actor& by);

  /// Codes included, unless `rows` says otherwise. A user is found in both
  /// spellings in which other programs may have stored quotes.
  Ended endUser(const User& user, const Actor& by, Rows rows = Rows::kAll);
  Ended endUserWith(const User& user, const ApplicationId& application, const Actor& by,
                    Rows rows = Rows::kAll);
  /// Logins and own tokens; the application stays registered.
  Ended endApplication(const ApplicationId& application, const Actor& by, Rows rows = Rows::kAll);
  Ended endEverything(const Actor& by, Rows rows = Rows::kAll);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_ACCESS_H
