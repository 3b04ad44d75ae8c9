// Whether there is something to look at. The library creates the database, and
// the stand-in cipher its key, as soon as they are needed; made by a command
// that only looks or tidies up, both would be its user's, and closed to the
// service's.

#ifndef KELDOAUTH_TOOLS_PRESENCE_H
#define KELDOAUTH_TOOLS_PRESENCE_H

namespace tool {

enum class Presence {
  kThere,
  kNoFile,    // in a folder that is there
  kNoTables,  // a file without content, or a database of something else
};

/// What is known without opening the store. Whatever else is wrong with the
/// file counts as there: the library says what.
Presence databasePresence();

/// Throws Failure when there is no database, and says what is missing.
void requireDatabase();

/// From now on the stand-in cipher of this process makes no key: without one it
/// fails.
void makeNoKey();

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_PRESENCE_H
