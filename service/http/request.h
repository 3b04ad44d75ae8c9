// A request, however it came here, and its parameters. The limits hold for every
// gateway: nothing outside may make the service read without end.

#ifndef KELDOAUTH_SERVICE_HTTP_REQUEST_H
#define KELDOAUTH_SERVICE_HTTP_REQUEST_H

#include <cstddef>
#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace keldoauth::service {

inline constexpr std::size_t kMaxQuery = 8192;
inline constexpr std::size_t kMaxBody = 16384;
inline constexpr std::size_t kMaxParameters = 64;

/// The pairs of a query or a form. A parameter without a value counts as
/// absent (RFC 6749, 3.1).
class Parameters {
 public:
  /// Nothing for bad percent-encoding, a NUL byte, or too many pairs.
  static std::optional<Parameters> parse(std::string_view text);

  /// The first value; empty when absent.
  [[nodiscard]] std::string value(std::string_view name) const;
  [[nodiscard]] bool has(std::string_view name) const { return !value(name).empty(); }

  /// Of a parameter that may occur several times; without those that are empty.
  [[nodiscard]] std::vector<std::string> values(std::string_view name) const;

  /// All of them once more as a query or a form, but for `names`.
  [[nodiscard]] std::string textWithout(std::initializer_list<std::string_view> names) const;

  [[nodiscard]] bool isDoubled(std::string_view name) const;
  [[nodiscard]] bool isAnyDoubled(std::initializer_list<std::string_view> names) const;

 private:
  std::vector<std::pair<std::string, std::string>> pairs_;
};

struct Request {
  std::string method;
  std::string path;  // as the browser asked for it, decoded: /oauth/token
  std::string query;
  std::string body;
  std::string contentType;    // lower case, without parameters
  std::string authorization;  // the headers as they came
  std::string cookie;
  std::string origin;
  std::string accept;
  std::string user;        // who it is from; empty: nobody has signed in
  long long authTime = 0;  // when that user's password was asked for
  std::string session;     // the session's identifier; empty: the web server vouches for the user
  std::string peer;        // the IP address that the request came from; empty: not known
  bool isSecure = false;   // it came by TLS

  [[nodiscard]] bool isRead() const { return method == "GET" || method == "HEAD"; }
  [[nodiscard]] bool isForm() const { return contentType == "application/x-www-form-urlencoded"; }
};

/// `%41` and `+` as a form means them. Nothing for bad encoding or a NUL byte.
std::optional<std::string> formDecode(std::string_view text);

/// The token of an Authorization header of the Bearer scheme, empty when it is
/// missing there; nothing for another scheme.
std::optional<std::string> bearerToken(const std::string& header);

/// Whether two words of a header are equal but for their case.
bool equalWords(std::string_view a, std::string_view b);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_HTTP_REQUEST_H
