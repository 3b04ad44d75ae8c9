// The stand-in cipher's key: 64 random bytes in a file that only its owner can
// read.

#ifndef KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H
#define KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H

#include <array>
#include <cstdint>

namespace keldcore {

using Key = std::array<std::uint8_t, 64>;

/// The file named by KELDCORE_KEY_FILE in the environment (ignored in a process
/// with raised privileges), else the one set when this was built.
const char* keyFilePath();

/// Reads the key, and makes it when the file is absent: whole or not at all,
/// and the same for all processes that race for it. False, with one line in the
/// system log, when the file is not exactly a key, not a regular file of the
/// effective user, or open to anybody else, and when it cannot be made.
bool loadKey(const char* path, Key& key);

}  // namespace keldcore

#endif  // KELDOAUTH_PLATFORM_STANDIN_KEY_FILE_H
