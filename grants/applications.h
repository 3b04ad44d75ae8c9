// The registry of applications.
//
// Rows that the registry's own Add stored have addresses without a scheme: they
// come as they stand there.

#ifndef KELDOAUTH_GRANTS_APPLICATIONS_H
#define KELDOAUTH_GRANTS_APPLICATIONS_H

#include <optional>
#include <string>
#include <vector>

#include "grants/outcome.h"
#include "grants/slice.h"
#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants {

class Store;

/// A confidential application has a secret. A public one, whose every user
/// holds its code, has none: its tokens end when they come again, and it gets
/// none for itself.
enum class ApplicationKind { kConfidential, kPublic };

struct Application {
  ApplicationId identifier;
  ApplicationName name;
  ApplicationKind kind;
  bool isEnabled;
  std::vector<RedirectAddress> addresses;
  std::vector<LogoutAddress> logoutAddresses;
  Scope scope;            // the most that it may be granted
  bool needsPkce;         // always true of a public one
  bool registeredItself;  // not by an administrator
  long long row;          // for showing only: ids are given out again
  /// Who a user is, is signed for it with ES256 and not with RS256, where that
  /// is said at all.
  bool wantsEs256 = false;
};

struct NewApplication {
  ApplicationName name;
  /// Absolute addresses in printable ASCII without a blank; none for an
  /// application that only acts for itself. What else an address must be is
  /// the service's to say. Together with what else is remembered of the
  /// application, a blank between any two, 2048 bytes.
  std::vector<RedirectAddress> addresses;
  Scope scope;
  ApplicationKind kind = ApplicationKind::kConfidential;
  std::vector<LogoutAddress> logoutAddresses = {};  // as the addresses
  bool needsPkce = true;
  bool registersItself = false;
  bool wantsEs256 = false;
  bool isEnabled = true;
  /// Generated when absent. An identifier has 64 of the letters, digits and
  /// "-._~".
  std::optional<ApplicationId> identifier = {};
  /// Generated when absent. Printable ASCII; not with a public one.
  std::optional<Secret> secret = {};
};

/// What a new application has to be told. The secret is told this once, or
/// asked for with secretOf; none for a public application.
struct Registered {
  ApplicationId identifier;
  std::optional<Secret> secret;
};

/// What is absent stays as it is, however it is stored.
struct ApplicationChange {
  std::optional<ApplicationName> name = {};
  std::optional<std::vector<RedirectAddress>> addresses = {};
  std::optional<std::vector<LogoutAddress>> logoutAddresses = {};
  std::optional<Scope> scope = {};
  std::optional<bool> needsPkce = {};
  std::optional<bool> wantsEs256 = {};
};

/// Rows that went with an application, dead and spent ones and pushed requests
/// included.
struct Removed {
  int codes;
  int tokens;
};

/// Every operation that changes something leaves one entry in the audit log
/// and fails when it cannot. Each throws Trouble.
class Applications {
 public:
  explicit Applications(Store& store) : store_(store) {}

  /// Refusals: kInvalidRedirectUri for addresses, kInvalidClientMetadata for
  /// the rest. A name that has an identifier's form (64 letters, digits and
  /// "-._~") is refused. When applications that registered themselves have
  /// their part of the registry, the oldest of them that has neither a code
  /// nor a token goes, or else the registry is full. Trouble: kFull.
  Outcome<Registered> add(const NewApplication& application, const Actor& by);

  // Look-ups ------------------------------------------------------------------

  // A text that no application can have finds none, without a look at the store.

  /// Nothing when it is not registered, or not any more.
  std::optional<Application> find(const ApplicationId& identifier) const;
  /// Several applications may have one name, byte by byte the same; in the order
  /// in which they registered, as are all.
  std::vector<Application> named(const ApplicationName& name) const;
  std::vector<Application> all() const;

  /// A part of those with `contains` in their names, upper and lower case of
  /// ASCII taken for the same, or whose whole identifier it is; of all when it
  /// is empty. In the order of their names, and of registration among equal
  /// ones.
  Sliced<Application> page(const std::string& contains, const Slice& slice = {}) const;

  /// The enabled application that has shown this secret, compared in constant
  /// time; without a secret, an enabled public one. Refusals: kInvalidClient.
  Outcome<Application> authenticate(const ApplicationId& identifier,
                                    const std::optional<Secret>& secret) const;

  /// For the administrator's eyes; none for a public application.
  std::optional<Secret> secretOf(const ApplicationId& identifier) const;

  // Changes -------------------------------------------------------------------
  // Refusals: kInvalidClient (kNoApplication), and as `add`. `by` is kItself when
  // an application that registered itself changes or removes itself: all of them
  // share one audit entry, as they do when they register.

  Outcome<Application> change(const ApplicationId& identifier, const ApplicationChange& change,
                              const Actor& by);

  /// The old secret is no good from now on. Refused (kUnauthorizedClient) for a
  /// public application.
  Outcome<Secret> renewSecret(const ApplicationId& identifier, const Actor& by);

  /// Nothing of a disabled application is issued, redeemed, refreshed or
  /// verified. Its rows stay, and serve again when it is enabled. Doing it
  /// twice is no fault and leaves no second entry.
  Outcome<Done> enable(const ApplicationId& identifier, const Actor& by);
  Outcome<Done> disable(const ApplicationId& identifier, const Actor& by);

  /// The application with its codes and tokens.
  Outcome<Removed> remove(const ApplicationId& identifier, const Actor& by);

 private:
  Store& store_;
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_APPLICATIONS_H
