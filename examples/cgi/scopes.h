// The scopes that this box knows, and what they mean to people.

#ifndef KELDOAUTH_EXAMPLES_CGI_SCOPES_H
#define KELDOAUTH_EXAMPLES_CGI_SCOPES_H

#include <array>
#include <string>
#include <vector>

namespace service {

struct Scope {
  const char* name;
  const char* words;
};

inline constexpr std::array<Scope, 4> kScopes{{
    {"profile", "See who you are: your user name on this box"},
    {"files.read", "See and download your files"},
    {"files.write", "Add, change and delete your files"},
    {"photos.read", "See your photo albums"},
}};

/// The words of a blank-separated list, each once, in order.
std::vector<std::string> scopeNames(const std::string& list);

/// The same as a list with one blank between two words.
std::string tidyScope(const std::string& list);

/// The words in `list` that this box knows; blank-separated.
std::string knownScopes(const std::string& list);

/// Every word of `asked` is in `granted`.
bool isWithin(const std::string& asked, const std::string& granted);

/// What a scope means; its name when the box does not know it.
std::string inWords(const std::string& scope);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_SCOPES_H
