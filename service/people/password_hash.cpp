#include "service/people/password_hash.h"

#include <crypt.h>

#include <array>
#include <memory>

namespace keldoauth::service {
namespace {

struct Manner {
  std::string_view start;
  const char* problem;  // empty: taken
};

constexpr char kTaken[] = "";
constexpr char kWeak[] = "is a hash that is guessed too fast";

/// The first that fits is right.
constexpr std::array<Manner, 15> kManners{{{"$y$", kTaken},
                                           {"$gy$", kTaken},
                                           {"$7$", kTaken},
                                           {"$2a$", kTaken},
                                           {"$2b$", kTaken},
                                           {"$2y$", kTaken},
                                           {"$5$", kTaken},
                                           {"$6$", kTaken},
                                           {"$apr1$", "is Apache's MD5 ($apr1$), guessed too fast"},
                                           {"{SHA}", "is SHA-1 without a salt, guessed too fast"},
                                           {"{SSHA}", "is one round of SHA-1, guessed too fast"},
                                           {"$1$", kWeak},
                                           {"$3$", kWeak},
                                           {"$md5", kWeak},
                                           {"$sha1$", kWeak}}};

/// Of the text that crypt(5) allows at all.
bool isClean(std::string_view hash) {
  for (const char c : hash) {
    if (c <= ' ' || c >= '\x7f' || c == ':' || c == ';' || c == '*' || c == '!' || c == '\\') {
      return false;
    }
  }
  return true;
}

bool startsWith(std::string_view text, std::string_view start) {
  return text.substr(0, start.size()) == start;
}

}  // namespace

std::string problemWithHash(std::string_view hash) {
  if (hash.empty()) return "is empty";
  if (hash[0] == '!' || hash[0] == '*') return "is locked";
  for (const Manner& manner : kManners) {
    if (!startsWith(hash, manner.start)) continue;
    if (*manner.problem != '\0') return manner.problem;
    return isClean(hash) ? "" : "has characters that no hash has";
  }
  return "is no hash that is known here (a password in clear?)";
}

std::optional<std::string> hashLike(const std::string& password, const std::string& setting) {
  // 32 KiB: too much for the stack of some hosts.
  const auto data = std::make_unique<crypt_data>();
  const char* hash = crypt_r(password.c_str(), setting.c_str(), data.get());
  if (hash == nullptr || hash[0] == '*') return std::nullopt;
  return std::string(hash);
}

std::optional<std::string> newHash(const std::string& password) {
  std::array<char, CRYPT_GENSALT_OUTPUT_SIZE> setting{};
  if (crypt_gensalt_rn("$y$", 0, nullptr, 0, setting.data(), int(setting.size())) == nullptr) {
    return std::nullopt;
  }
  return hashLike(password, setting.data());
}

}  // namespace keldoauth::service
