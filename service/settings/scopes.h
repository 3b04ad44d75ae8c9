// The scopes that this box knows, and what they mean to people.

#ifndef KELDOAUTH_SERVICE_SETTINGS_SCOPES_H
#define KELDOAUTH_SERVICE_SETTINGS_SCOPES_H

#include <string>
#include <vector>

namespace keldoauth::service {

struct KnownScope {
  std::string name;
  std::string words;
};

class ScopeTable {
 public:
  ScopeTable() = default;
  explicit ScopeTable(std::vector<KnownScope> scopes);

  [[nodiscard]] auto begin() const { return scopes_.begin(); }
  [[nodiscard]] auto end() const { return scopes_.end(); }

  /// The words in `list` that this box knows; blank-separated.
  [[nodiscard]] std::string known(const std::string& list) const;

  /// What a scope means; its name when the box does not know it.
  [[nodiscard]] std::string inWords(const std::string& scope) const;

 private:
  [[nodiscard]] const KnownScope* find(const std::string& name) const;

  std::vector<KnownScope> scopes_;
};

/// The words of a blank-separated list, each once, in order.
std::vector<std::string> scopeNames(const std::string& list);

/// The same as a list with one blank between two words.
std::string tidyScope(const std::string& list);

/// Every word of `asked` is in `granted`.
bool isWithin(const std::string& asked, const std::string& granted);

}  // namespace keldoauth::service

#endif  // KELDOAUTH_SERVICE_SETTINGS_SCOPES_H
