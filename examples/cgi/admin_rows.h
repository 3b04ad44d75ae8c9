// What the administrator's page reads from the stores and changes in them. All
// of it throws Unavailable when a store cannot say.

#ifndef KELDOAUTH_EXAMPLES_CGI_ADMIN_ROWS_H
#define KELDOAUTH_EXAMPLES_CGI_ADMIN_ROWS_H

#include <string>
#include <vector>

#include "examples/cgi/clients.h"

namespace service {

std::vector<Client> allClients();

/// What an application may do for a user, by all of their grants together:
/// codes that can be redeemed, pairs of tokens that work or can be renewed.
struct Access {
  enum class State { kAllowed, kRenewable, kInUse };  // the best of them counts
  std::string user;
  std::string clientId;
  State state = State::kAllowed;
  std::string scope;
  long long expires = 0;  // the last to expire
  int grants = 0;
};

/// By user and application.
std::vector<Access> allAccess();

struct LogEntry {
  long long time;
  std::string text;
};

inline constexpr int kLogRows = 200;

/// A page of the entries that contain `filter`, the newest first. Page 1 is the
/// newest; pages have kLogRows entries, and one more when another page follows.
std::vector<LogEntry> logEntries(const std::string& filter, int page);

struct Fill {
  const char* what;
  long long rows;
  int limit;
  bool refuses;  // new rows, when it is full
};

/// How full each table is.
std::vector<Fill> tableFill();

/// False when there is no such row any more.
bool setEnabled(long long id, bool enabled);
bool removeAccess(const std::string& user, const std::string& clientId);

/// The application with everything that lets it in.
bool removeClient(const Client& client);

/// One line for the audit log. Whether it could be stored changes nothing.
void note(const std::string& text);

}  // namespace service

#endif  // KELDOAUTH_EXAMPLES_CGI_ADMIN_ROWS_H
