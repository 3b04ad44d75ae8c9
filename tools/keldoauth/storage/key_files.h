// The stand-in cipher's key on the disk. A platform's own cipher keeps its key
// elsewhere and has none of these files.

#ifndef KELDOAUTH_TOOLS_KEY_FILES_H
#define KELDOAUTH_TOOLS_KEY_FILES_H

#include <string>

namespace tool {

/// Where the stand-in cipher has its key, and where a new one waits while
/// `keldoauth rekey` is at work, or after that was interrupted: what the
/// environment said before useKey() changed it.
struct KeyFiles {
  std::string current;
  std::string next;
};
KeyFiles keyFiles();

/// From now on the stand-in cipher of this process takes that key.
void useKey(const std::string& file);

/// "the key file <path> is missing", empty when it is there. It always is
/// missing where the cipher is the platform's own.
std::string absenceOfKey();

/// What to do when the cipher refuses: names a missing key.
std::string adviceOnCipher();

/// Writes a new key, the owner's alone, under a free name and syncs the file.
/// Throws Failure.
void drawKey(const std::string& path);

/// Removes what processes left that were killed while they made the key `path`.
/// Throws Failure.
void removeKeyDrafts(const std::string& path);

}  // namespace tool

#endif  // KELDOAUTH_TOOLS_KEY_FILES_H
