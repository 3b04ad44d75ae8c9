// The lengths that the stores accept, in bytes, both ends included. No such
// number stands anywhere else.

#ifndef KELDOAUTH_UTILS_OAUTH_BOUNDS_H
#define KELDOAUTH_UTILS_OAUTH_BOUNDS_H

namespace KELDOAUTHSERVER {

struct Bounds {
  int min;
  int max;
};

/// Client identifiers, client secrets, codes and tokens have this length, and
/// getRandomStr is asked for it.
inline constexpr unsigned int kIdentifierLength = 64;

namespace bounds {

inline constexpr Bounds kIdentifier{kIdentifierLength, kIdentifierLength};
inline constexpr Bounds kUsername{1, 256};
inline constexpr Bounds kRedirectUri{3, 2048};
inline constexpr Bounds kScope{1, 2048};
inline constexpr Bounds kState{1, 2048};
inline constexpr Bounds kDisplayName{1, 64};
inline constexpr Bounds kExpiredTime{1, 128};
inline constexpr Bounds kFlowType{1, 32};

}  // namespace bounds
}  // namespace KELDOAUTHSERVER

#endif  // KELDOAUTH_UTILS_OAUTH_BOUNDS_H
