#include "service/signing/key_set.h"

#include <algorithm>

#include "service/signing/key_fault.h"

namespace keldoauth::service::signing {

std::string_view nameOf(State state) {
  switch (state) {
    case State::kNext:
      return "next";
    case State::kCurrent:
      return "current";
    case State::kPrevious:
      return "previous";
    default:
      return "over";
  }
}

KeySet KeySet::make(Time now) {
  KeySet set;
  set.replace(now);
  return set;
}

void KeySet::sort() {
  std::stable_sort(keys_.begin(), keys_.end(), [](const DatedKey& a, const DatedKey& b) {
    if (a.key.algorithm() != b.key.algorithm()) return a.key.algorithm() < b.key.algorithm();
    return a.signsFrom < b.signsFrom;
  });
}

/// The youngest that may sign; where the clock stands before all of them, the
/// oldest.
std::size_t KeySet::currentOf(Algorithm algorithm, Time now) const {
  std::size_t current = keys_.size();
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    if (keys_[i].key.algorithm() != algorithm) continue;
    if (current == keys_.size() || keys_[i].signsFrom <= now) current = i;
  }
  if (current == keys_.size()) throw KeyFault("no key for " + std::string(nameOf(algorithm)));
  return current;
}

State KeySet::stateOf(std::size_t at, Time now) const {
  const std::size_t current = currentOf(keys_[at].key.algorithm(), now);
  if (at == current) return State::kCurrent;
  if (at > current) return State::kNext;
  return now - keys_[at + 1].signsFrom < kAfter ? State::kPrevious : State::kOver;
}

const Key& KeySet::signingKey(Algorithm algorithm, Time now) const {
  return keys_[currentOf(algorithm, now)].key;
}

const Key* KeySet::find(std::string_view identifier) const {
  for (const DatedKey& dated : keys_) {
    if (dated.key.identifier() == identifier) return &dated.key;
  }
  return nullptr;
}

Json::Value KeySet::publicSet(Time now) const {
  Json::Value set(Json::objectValue);
  set["keys"] = Json::Value(Json::arrayValue);
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    if (stateOf(i, now) != State::kOver) set["keys"].append(keys_[i].key.publicJwk());
  }
  return set;
}

void KeySet::add(Algorithm algorithm, Time now, Time signsFrom) {
  keys_.push_back({Key::make(algorithm), now, signsFrom});
  sort();
}

/// Times that a clock set forward by mistake has left would stop all change
/// until they come.
void KeySet::takeBackTheFuture(Algorithm algorithm, Time now) {
  const std::size_t current = currentOf(algorithm, now);
  for (std::size_t i = current; i < keys_.size(); ++i) {
    DatedKey& dated = keys_[i];
    if (dated.key.algorithm() != algorithm) break;
    dated.signsFrom = std::min(dated.signsFrom, i == current ? now : now + kAhead);
  }
}

void KeySet::forget(Time now) {
  std::vector<DatedKey> kept;
  for (std::size_t i = 0; i < keys_.size(); ++i) {
    if (stateOf(i, now) != State::kOver) kept.push_back(keys_[i]);
  }
  keys_ = std::move(kept);
}

void KeySet::rotate(Time now) {
  forget(now);
  for (const Algorithm algorithm : kAlgorithms) {
    takeBackTheFuture(algorithm, now);
    const std::size_t successor = currentOf(algorithm, now) + 1;
    const bool isThere = successor < keys_.size() && keys_[successor].key.algorithm() == algorithm;
    if (!isThere) add(algorithm, now, now + kAhead);
  }
}

void KeySet::replace(Time now) {
  KeySet fresh;
  for (const Algorithm algorithm : kAlgorithms) fresh.add(algorithm, now, now);
  keys_ = std::move(fresh.keys_);
}

bool KeySet::isDue(Time now, Time age) const {
  return std::any_of(std::begin(kAlgorithms), std::end(kAlgorithms), [&](Algorithm algorithm) {
    const std::size_t current = currentOf(algorithm, now);
    const bool isLast =
        current + 1 == keys_.size() || keys_[current + 1].key.algorithm() != algorithm;
    return isLast && now - keys_[current].signsFrom >= age;
  });
}

}  // namespace keldoauth::service::signing
