// The installation's choice of an engine, as it stands in the state folder
// (engines/choice/choice.h).

#ifndef KELDOAUTH_TOOLS_ENGINE_CHOICE_H
#define KELDOAUTH_TOOLS_ENGINE_CHOICE_H

#include <string>
#include <vector>

namespace tool {

/// Whether the store is on a server, reachable or not.
bool isOnServer();

/// Of the server: names::kDatabaseFile's folder, and what an administrator puts
/// into it.
std::string connectionFile();

/// Where the file of the store waits meanwhile.
std::string fileSetAside();

/// The store's own name leads to the server from now on, in one step; a file
/// that had it waits as fileSetAside(). Throws Failure.
void chooseServer();

/// The other way round. A file that waited is the store again. Throws Failure.
void chooseFile();

/// Throws Failure for a command that `remedy` stands in for on a server.
void requireFile(const std::string& remedy);

/// The tables with encrypted columns: on a server the one with the text that
/// tells the keys apart, too.
std::vector<const char*> tablesWithSecrets();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_ENGINE_CHOICE_H
