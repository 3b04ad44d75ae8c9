// A part of a long list, as a page shows it.

#ifndef KELDOAUTH_GRANTS_SLICE_H
#define KELDOAUTH_GRANTS_SLICE_H

#include <vector>

namespace KELDOAUTHSERVER::grants {

/// Numbers below 0 count as 0.
struct Slice {
  int most = 50;
  int skipped = 0;  // so many are left out at the start
};

template <typename Item>
struct Sliced {
  std::vector<Item> items;
  long long total;  // of the whole list, at the same moment
};

}  // namespace KELDOAUTHSERVER::grants

#endif  // KELDOAUTH_GRANTS_SLICE_H
