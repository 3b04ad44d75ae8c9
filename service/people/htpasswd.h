// A file of people, as htpasswd(1) keeps one: a line for each, "name:hash".
// Blank lines and those that start with '#' are passed over; of two lines with
// one name the first counts.

#ifndef KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_H
#define KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "service/people/directory.h"

namespace keldoauth::service {

struct HtpasswdLine {
  std::size_t number;  // from 1
  std::string name;
  std::string hash;
  std::string problem;  // why nobody signs in by this line; empty: somebody does
};

/// Every line that is not passed over, usable or not.
std::vector<HtpasswdLine> readHtpasswd(std::string_view text);

/// More are not read: thousands of people.
inline constexpr std::size_t kMaxHtpasswdBytes = std::size_t{1} << 20U;

/// The text of the file; throws DirectoryTrouble with a line for the
/// administrator.
std::string htpasswdText(const std::string& path);

class HtpasswdUsers : public Directory {
 public:
  /// `key` is secret: it keeps outsiders from learning how long whose check
  /// takes.
  HtpasswdUsers(std::string path, std::string key) : path_(std::move(path)), key_(std::move(key)) {}

  /// The name must be the file's, byte for byte. A name that is not there costs
  /// what some name that is there costs, and always the same one.
  [[nodiscard]] PasswordCheck checkPassword(const std::string& user,
                                            const std::string& password) const override;

  /// The hash: a new password, or none any more, ends every session.
  [[nodiscard]] std::optional<std::string> stampOf(const std::string& user) const override;

  /// The first line with a problem, or that the file cannot be read.
  [[nodiscard]] std::string problem() const override;

 private:
  [[nodiscard]] std::string nobodysHash(const std::vector<HtpasswdLine>& lines,
                                        const std::string& user) const;

  std::string path_;
  std::string key_;
};

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_PEOPLE_HTPASSWD_H
