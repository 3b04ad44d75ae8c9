#include "engines/postgresql/connection_text.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <libpq-fe.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string_view>

namespace keldoauth::postgresql {
namespace {

constexpr std::size_t kMostBytes = 16384;

[[noreturn]] void refuse(const std::string& reason) {
  throw std::runtime_error("the connection text " + reason);
}

// The file --------------------------------------------------------------------------

class Descriptor {
 public:
  explicit Descriptor(int number) : number_(number) {}
  ~Descriptor() {
    if (number_ >= 0) close(number_);
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  [[nodiscard]] int number() const { return number_; }

 private:
  int number_;
};

/// It names a password, and where every login goes: nobody but its owner may
/// read it, let alone write it.
void requirePrivate(int descriptor) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0 || !S_ISREG(status.st_mode)) refuse("is no regular file");
  if ((status.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
    refuse("is open to others: its mode must be 0600");
  }
}

std::string readText(const char* path) {
  const Descriptor file(open(path, O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  if (file.number() < 0) refuse(errno == ENOENT ? "is missing" : "cannot be read");
  requirePrivate(file.number());
  std::string text;
  std::array<char, 4096> part{};
  ssize_t got = 0;
  while ((got = read(file.number(), part.data(), part.size())) > 0) {
    text.append(part.data(), static_cast<std::size_t>(got));
    if (text.size() > kMostBytes) refuse("is too long");
  }
  if (got < 0) refuse("cannot be read");
  return text;
}

std::string withoutComments(const std::string& text) {
  std::istringstream lines(text);
  std::string kept;
  for (std::string line; std::getline(lines, line);) {
    if (line.empty() || line.front() == '#') continue;
    kept += line + " ";
  }
  return kept;
}

// Its options -----------------------------------------------------------------------

struct FreeOptions {
  void operator()(PQconninfoOption* options) const { PQconninfoFree(options); }
};
using Parsed = std::unique_ptr<PQconninfoOption, FreeOptions>;

/// libpq's own reason would quote the text.
Parsed parse(const std::string& text) {
  char* reason = nullptr;
  Parsed parsed(PQconninfoParse(text.c_str(), &reason));
  PQfreemem(reason);
  if (parsed == nullptr) refuse("is none that libpq understands");
  return parsed;
}

/// What the text leaves open libpq takes from the environment, where it would be
/// another's to say which server the store is on.
Options givenOptions(const PQconninfoOption* option) {
  Options given;
  for (; option->keyword != nullptr; ++option) {
    if (option->val != nullptr) {
      given.emplace_back(option->keyword, option->val);
    } else if (option->envvar != nullptr && std::getenv(option->envvar) != nullptr) {
      refuse(std::string("leaves open what ") + option->envvar +
             " in the environment says: take the variable away, or say " + option->keyword);
    }
  }
  return given;
}

std::string valueOf(const Options& options, std::string_view keyword) {
  for (const auto& [key, value] : options) {
    if (key == keyword) return value;
  }
  return {};
}

void set(Options& options, const std::string& keyword, const std::string& value) {
  for (auto& [key, current] : options) {
    if (key != keyword) continue;
    current = value;
    return;
  }
  options.emplace_back(keyword, value);
}

// Its servers -----------------------------------------------------------------------

std::vector<std::string> parts(const std::string& list) {
  std::vector<std::string> all;
  std::istringstream stream(list);
  for (std::string part; std::getline(stream, part, ',');) all.push_back(part);
  return all;
}

/// The i-th of a list, or the only one for all.
std::string partFor(const std::vector<std::string>& all, std::size_t i, const char* what) {
  if (all.size() == 1) return all.front();
  if (i >= all.size()) refuse(std::string("names more hosts than ") + what + "s");
  return all[i];
}

/// A name that begins like an address of this box may be anybody's.
bool isOnThisBox(const std::string& host) {
  in_addr address{};
  const bool isLoopback = inet_pton(AF_INET, host.c_str(), &address) == 1 &&
                          (ntohl(address.s_addr) >> 24) == IN_LOOPBACKNET;
  return host.front() == '/' || host.front() == '@' || host == "localhost" || host == "::1" ||
         isLoopback;
}

void requireIdentity(const Options& options) {
  const std::string address = valueOf(options, "hostaddr");
  const std::string host = address.empty() ? valueOf(options, "host") : address;
  if (isOnThisBox(host) || valueOf(options, "sslmode") == "verify-full") return;
  refuse("must say sslmode=verify-full: the server is on another box");
}

/// libpq would go through the hosts one after the other, and wait for each.
Servers split(const Options& options) {
  const auto hosts = parts(valueOf(options, "host"));
  const auto addresses = parts(valueOf(options, "hostaddr"));
  const auto ports = parts(valueOf(options, "port"));
  if (hosts.empty()) refuse("must say host");
  Servers servers;
  for (std::size_t i = 0; i < hosts.size(); ++i) {
    if (hosts[i].empty()) refuse("names a host without a name");
    Options one = options;
    set(one, "host", hosts[i]);
    if (!addresses.empty()) set(one, "hostaddr", partFor(addresses, i, "address"));
    if (!ports.empty()) set(one, "port", partFor(ports, i, "port"));
    requireIdentity(one);
    servers.push_back(std::move(one));
  }
  return servers;
}

}  // namespace

Servers readServers(const char* path) {
  Options options = givenOptions(parse(withoutComments(readText(path))).get());
  for (const char* keyword : {"host", "dbname", "user"}) {
    if (valueOf(options, keyword).empty()) refuse(std::string("must say ") + keyword);
  }
  if (!valueOf(options, "service").empty()) refuse("must not refer to a service");
  // Bytes as they are; Kerberos would be asked for first; which servers can be
  // written to is looked at here, for all of them at once.
  set(options, "client_encoding", "SQL_ASCII");
  set(options, "gssencmode", "disable");
  set(options, "target_session_attrs", "any");
  if (valueOf(options, "application_name").empty()) set(options, "application_name", "keldoauth");
  return split(options);
}

}  // namespace keldoauth::postgresql
