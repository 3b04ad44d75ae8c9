#include "service/people/throttle.h"

#include <syslog.h>

#include <algorithm>
#include <ctime>

#include "service/text/encoding.h"
#include "utils/wide_time.h"

namespace keldoauth::service {
namespace {

struct Allowance {
  int atOnce;
  int everySeconds;

  [[nodiscard]] int whole() const { return atOnce * everySeconds; }
};

/// In the order of Deed.
constexpr std::array<Allowance, 5> kAllowances{{{10, 60}, {10, 600}, {10, 60}, {20, 5}, {60, 60}}};
constexpr std::size_t kBucketsPerDeed = CounterFile::kBuckets / kAllowances.size();

Allowance allowanceOf(Deed deed) {
  return kAllowances.at(static_cast<std::size_t>(deed));
}

std::uint32_t now() {
  return static_cast<std::uint32_t>(std::time(nullptr));
}

/// How long a slot still counts for. More than the whole allowance cannot be:
/// the file is damaged, or the clock was set back.
int secondsLeft(const CounterSlot& slot, const Allowance& allowance, std::uint32_t time) {
  const auto left = static_cast<std::int32_t>(slot.until - time);
  return slot.tag == 0 || left < 0 || left > allowance.whole() ? 0 : left;
}

std::uint32_t word(const std::string& digest, std::size_t index) {
  std::uint32_t value = 0;
  for (std::size_t i = 0; i < sizeof value; ++i) {
    value = value << 8U | static_cast<unsigned char>(digest[index * sizeof value + i]);
  }
  return value;
}

CounterSlot* find(CounterBucket& slots, std::uint32_t tag) {
  const auto slot = std::find_if(slots.begin(), slots.end(),
                                 [&](const CounterSlot& each) { return each.tag == tag; });
  return slot == slots.end() ? nullptr : &*slot;
}

/// Its own, or that of whoever has the least left.
CounterSlot& slotFor(CounterBucket& slots, std::uint32_t tag, const Allowance& allowance,
                     std::uint32_t time) {
  if (CounterSlot* own = find(slots, tag)) return *own;
  CounterSlot& least =
      *std::min_element(slots.begin(), slots.end(), [&](const auto& a, const auto& b) {
        return secondsLeft(a, allowance, time) < secondsLeft(b, allowance, time);
      });
  least = {tag, time};
  return least;
}

}  // namespace

Throttle::Place Throttle::placeOf(Deed deed, const std::string& whom) const {
  const auto number = static_cast<std::size_t>(deed);
  const std::string digest = hmacSha256(key_, "throttle\n" + std::to_string(number) + "\n" + whom);
  return {number * kBucketsPerDeed + word(digest, 0) % kBucketsPerDeed,
          std::max<std::uint32_t>(word(digest, 1), 1)};
}

void Throttle::change(std::size_t bucket, const std::function<bool(CounterBucket&)>& change) {
  if (path_.empty() || counters_.change(bucket, change) || hasComplained_) return;
  hasComplained_ = true;
  syslog(LOG_AUTH | LOG_WARNING, "cannot keep counters: failed sign-ins are not slowed down");
}

int Throttle::take(Deed deed, const std::string& whom) {
  const Allowance allowance = allowanceOf(deed);
  const Place place = placeOf(deed, whom);
  int wait = 0;
  change(place.bucket, [&](CounterBucket& slots) {
    const std::uint32_t time = now();
    CounterSlot& slot = slotFor(slots, place.tag, allowance, time);
    const int left = secondsLeft(slot, allowance, time) + allowance.everySeconds;
    wait = std::max(0, left - allowance.whole());
    if (wait == 0) slot.until = time + static_cast<std::uint32_t>(left);
    return wait == 0;
  });
  return wait;
}

void Throttle::giveBack(Deed deed, const std::string& whom) {
  const Allowance allowance = allowanceOf(deed);
  const Place place = placeOf(deed, whom);
  change(place.bucket, [&](CounterBucket& slots) {
    CounterSlot* slot = find(slots, place.tag);
    if (slot == nullptr) return false;
    const std::uint32_t time = now();
    const int left = std::max(0, secondsLeft(*slot, allowance, time) - allowance.everySeconds);
    slot->until = time + static_cast<std::uint32_t>(left);
    return true;
  });
}

}  // namespace keldoauth::service
