// Entries of the audit log, written within the transaction of an operation and
// last in it. Throw Trouble: an operation that cannot write its entry fails.

#ifndef KELDOAUTH_GRANTS_ROWS_NOTES_H
#define KELDOAUTH_GRANTS_ROWS_NOTES_H

#include <optional>
#include <string>

#include "grants/rows/store.h"
#include "grants/texts.h"

namespace KELDOAUTHSERVER::grants::rows {

/// The tail of a look into the log.
inline constexpr char kNewestFirst[] = "ORDER BY id DESC";

/// Of an entry that is about one.
struct Subject {
  std::optional<ApplicationName> name;
  std::string identifier;
  bool registeredItself;
};

/// "[Photo Frame 1a2b3c4d]"; without a name "[removed 1a2b3c4d]".
std::string applicationWord(const std::optional<ApplicationName>& name,
                            const std::string& identifier);

/// " for [alice]"; nothing without a user.
std::string userWord(const std::optional<std::string>& user);

/// " by [bob]"
std::string actorWord(const Actor& by);

inline constexpr char kByItself[] = " by itself";
inline constexpr char kAfterReplay[] = " after a replay";

/// Writes `subject` and `detail`, or counts it when there is an entry for the
/// subject within the policy's pause. The detail is that of the first.
void note(Store& store, const std::string& subject, const std::string& detail = "");

/// "Access ended[Photo Frame 1a2b3c4d] for [alice] by [bob]". Anybody can let
/// any number of applications register themselves, and end what they have: for
/// each user, those have one subject together.
void noteEnd(Store& store, const Subject& application, const std::optional<std::string>& user,
             const std::string& by, const std::string& what = "Access ended");

}  // namespace KELDOAUTHSERVER::grants::rows

#endif  // KELDOAUTH_GRANTS_ROWS_NOTES_H
