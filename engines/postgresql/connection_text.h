// The file that says where the store is: libpq's connection text, in lines as
// one likes; those that begin with '#' are for people.

#ifndef KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_TEXT_H
#define KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_TEXT_H

#include <string>
#include <utility>
#include <vector>

namespace keldoauth::postgresql {

/// Keywords of libpq and their values.
using Options = std::vector<std::pair<std::string, std::string>>;

/// One set of options for each server that the text names.
using Servers = std::vector<Options>;

/// Throws std::runtime_error that says what is wrong, and never quotes the text:
/// a file that others can read, an option that libpq does not know, a server
/// that is reached through a network without its identity being checked, or a
/// variable of the environment that would change where the text leads.
Servers readServers(const char* path);

}  // namespace keldoauth::postgresql

#endif  // KELDOAUTH_ENGINES_POSTGRESQL_CONNECTION_TEXT_H
