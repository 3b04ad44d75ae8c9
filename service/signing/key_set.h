// The keys of a service, and which of them signs when.
//
//   state      published  signs   from                 until
//   next       yes        no      it was made          kAhead later
//   current    yes        yes     its signsFrom        that of its successor
//   previous   yes        no      its successor's      kAfter later
//   over       no         no      then                 the next rotation removes it
//
// An application keeps the published keys for a while: a key is among them for
// kAhead before anything is signed with it, and for kAfter when everything signed
// with it has expired. The states follow from the times alone, so that nothing has
// to run at the moment of change. A clock that was wrong does no lasting harm: there
// always is one key that signs, and the next rotation takes back what lies too far
// ahead.

#ifndef KELDOAUTH_SERVICE_SIGNING_KEY_SET_H
#define KELDOAUTH_SERVICE_SIGNING_KEY_SET_H

#include <json/value.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "service/signing/key.h"

namespace keldoauth::service::signing {

/// Seconds since 1970; 64 bits everywhere.
using Time = std::int64_t;

inline constexpr Time kAhead = 86400;
/// An id_token must not live longer.
inline constexpr Time kAfter = 86400;

/// Bounds of the file. Rotations leave four keys of an algorithm at most.
inline constexpr std::size_t kMaxKeys = 32;
inline constexpr std::size_t kMaxKeySetText = 131072;  // bytes

enum class State { kNext, kCurrent, kPrevious, kOver };
std::string_view nameOf(State state);

struct DatedKey {
  Key key;
  Time made = 0;
  Time signsFrom = 0;
};

class KeySet {
 public:
  /// One key of each algorithm, which signs from `now`. Takes seconds on a small
  /// machine. Throws KeyFault without random numbers.
  static KeySet make(Time now);

  /// From what text() gave. Throws KeyFault unless everything is as it must be:
  /// no member too many or too few, every key as Key::read wants it with the
  /// kid that it must have, none twice, each algorithm there.
  static KeySet read(std::string_view text);

  /// A JWK set with the secrets and the times (`made`, `signs_from`).
  [[nodiscard]] std::string text() const;

  /// Those of one algorithm together, the oldest first.
  [[nodiscard]] const std::vector<DatedKey>& keys() const { return keys_; }
  /// Of keys()[at].
  [[nodiscard]] State stateOf(std::size_t at, Time now) const;

  [[nodiscard]] const Key& signingKey(Algorithm algorithm, Time now) const;
  /// The key with that `kid` in any state, null without one.
  [[nodiscard]] const Key* find(std::string_view identifier) const;

  /// The JWK set for everybody: next, current and previous.
  [[nodiscard]] Json::Value publicSet(Time now) const;

  /// Makes a next key where there is none, and removes what is over. Calling it
  /// twice rotates once. Throws KeyFault without random numbers.
  void rotate(Time now);

  /// Only removes what is over.
  void forget(Time now);

  /// For a key that has become known to others: fresh ones sign at once, and
  /// nothing that the old ones signed is good any more.
  void replace(Time now);

  /// Whether a key without a successor has been signing for `age` seconds.
  [[nodiscard]] bool isDue(Time now, Time age) const;

 private:
  [[nodiscard]] std::size_t currentOf(Algorithm algorithm, Time now) const;
  void takeBackTheFuture(Algorithm algorithm, Time now);
  void add(Algorithm algorithm, Time now, Time signsFrom);
  void sort();

  std::vector<DatedKey> keys_;
};

}  // namespace keldoauth::service::signing

#endif  // KELDOAUTH_SERVICE_SIGNING_KEY_SET_H
