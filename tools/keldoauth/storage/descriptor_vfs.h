// Lets SQLite write a database through a descriptor that is open already.

#ifndef KELDOAUTH_TOOLS_DESCRIPTOR_VFS_H
#define KELDOAUTH_TOOLS_DESCRIPTOR_VFS_H

#include <string>

namespace tool {

/// For sqlite3_open_v2: the name of the file is the descriptor's number. The
/// descriptor stays open when the connection closes. There is nothing beside
/// the file: no journal, no lock, no temporary file, so that it is for a draft
/// that nobody else knows; the connection has to be told not to keep a journal.
/// What is written as a database in WAL mode becomes one that stands alone.
const char* descriptorVfs();
std::string descriptorName(int descriptor);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_DESCRIPTOR_VFS_H
