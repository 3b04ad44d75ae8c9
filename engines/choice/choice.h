// The one setting that says which engine the store is on: what stands under the
// store's own name. A link to the connection text means a server; a file, or
// nothing, SQLite.

#ifndef KELDOAUTH_ENGINES_CHOICE_CHOICE_H
#define KELDOAUTH_ENGINES_CHOICE_CHOICE_H

namespace KELDOAUTHSERVER::engines {

/// Where the link leads, in the same folder: the connection text.
inline constexpr char kServerFile[] = "oauth.postgresql";

/// The library that stands in SQLite's place then.
inline constexpr char kServerLibrary[] = "libkeldoauth-postgresql.so.1";

/// Whether `path` is that link. No file is opened for it: to close a descriptor
/// of a database drops the locks that SQLite has on it.
bool isOnServer(const char* path);

}  // namespace KELDOAUTHSERVER::engines

#endif  // KELDOAUTH_ENGINES_CHOICE_CHOICE_H
