// What the stand-in has to know of the store before it makes a key: a key made
// beside values that another one encrypted would hide that theirs is missing.

#ifndef KELDOAUTH_PLATFORM_STANDIN_STORE_FILE_H
#define KELDOAUTH_PLATFORM_STANDIN_STORE_FILE_H

namespace keldcore {

enum class StoredValues {
  kNone,     // no store, or one without a client, a code and a token
  kSome,     // they have an encrypted column each
  kUnknown,  // the file cannot be read, or is not in SQLite's plain format
};

/// Looks at the file as it is on the disk, without a lock and without SQLite.
/// It is read through a descriptor that this process has open already, where
/// there is one: closing another one would end SQLite's locks on it, and the
/// effective user may not be the one who may open it. Where there is none, the
/// one opened here stays open for the same reason, for this and later looks.
StoredValues storedValues(const char* path);

}  // namespace keldcore

#endif  // KELDOAUTH_PLATFORM_STANDIN_STORE_FILE_H
