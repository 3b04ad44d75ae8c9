// A medium of its own in place of the state folder: small, and read-only on
// demand.

#ifndef KELDOAUTH_TESTS_FAULTS_SMALL_MEDIUM_H
#define KELDOAUTH_TESTS_FAULTS_SMALL_MEDIUM_H

#include <string>

namespace faults {

class SmallMedium {
 public:
  /// Mounts an empty one over `folder`.
  explicit SmallMedium(const std::string& folder);
  ~SmallMedium();
  SmallMedium(const SmallMedium&) = delete;
  SmallMedium& operator=(const SmallMedium&) = delete;

  /// Uses it up but for `pages` of SQLite's.
  void fill(int pages) const;
  void empty() const;

  /// For when no file on it is open.
  void setReadOnly(bool readOnly) const;

 private:
  std::string folder_;
  std::string filler_;
};

}  // namespace faults

#endif  // KELDOAUTH_TESTS_FAULTS_SMALL_MEDIUM_H
