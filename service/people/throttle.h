// How often something may go wrong. Every kind of deed has an allowance for each
// whom it counts: so many at once, and then one more each time some seconds have
// passed. Nobody is locked out for longer than that; and nothing but the time
// that passes makes an allowance whole again.
//
// There are 4096 slots for each kind. A thousand names at once are all counted
// exactly. A flood of more takes slots from those with the least to wait for, and
// so from an account under attack last; it never makes anybody wait, for a slot
// is one name's alone: that two take each other's for their own has a chance of
// one in 268 million. The file shows neither who is counted nor how to meet whose
// slot: names stand in it as digests under a key.

#ifndef KELDOAUTH_SERVICE_PEOPLE_THROTTLE_H
#define KELDOAUTH_SERVICE_PEOPLE_THROTTLE_H

#include <string>

#include "service/people/counter_file.h"

namespace keldoauth::service {

enum class Deed {
  kSignInFromAddress,       // 10 at once, then one a minute
  kSignInOfAccount,         // 10 at once, then one in ten minutes
  kSignInOfKnownBrowser,    // 10 at once, then one a minute
  kWrongSecretFromAddress,  // 20 at once, then one in five seconds
  kRegistrationFromAddress  // 60 at once, then one a minute
};

class Throttle {
 public:
  /// The counters lie in `path`, below a folder that only the service may write
  /// to; an empty path counts nothing. `key` is secret.
  Throttle(const std::string& path, std::string key)
      : path_(path), counters_(path), key_(std::move(key)) {}

  /// Where the counters lie.
  [[nodiscard]] const std::string& path() const { return path_; }

  /// 0: it may be done, and is counted. Otherwise it may not, is not counted, and
  /// could be done in so many seconds. Where counters cannot be kept everything
  /// may be done, which the system log hears once.
  int take(Deed deed, const std::string& whom);

  /// What was taken did no harm.
  void giveBack(Deed deed, const std::string& whom);

 private:
  struct Place {
    std::size_t bucket;
    std::uint32_t tag;
  };
  [[nodiscard]] Place placeOf(Deed deed, const std::string& whom) const;
  void change(std::size_t bucket, const std::function<bool(CounterBucket&)>& change);

  std::string path_;
  bool hasComplained_ = false;
  CounterFile counters_;
  std::string key_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_THROTTLE_H
