// Databases of a given size on the library's real paths, made once each and
// copied into place before every measurement.

#ifndef KELDOAUTH_BENCH_WORLD_H
#define KELDOAUTH_BENCH_WORLD_H

namespace bench {

/// What the tables hold, beside one registered application. Token rows have the serials 1 to
/// `tokens`, the first `expired` of which have expired; log rows lie a second apart.
struct Contents {
  int tokens = 0;
  int expired = 0;
  int logRows = 0;
};

/// Puts a database with these contents, and settings that leave room for more,
/// in place.
void install(const Contents& contents, int logMax = 10000);

}  // namespace bench

#endif  // KELDOAUTH_BENCH_WORLD_H
