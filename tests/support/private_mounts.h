// The library works on absolute paths: outside private mounts over them a test
// program would work on the host's own state.

#ifndef KELDOAUTH_TESTS_SUPPORT_PRIVATE_MOUNTS_H
#define KELDOAUTH_TESTS_SUPPORT_PRIVATE_MOUNTS_H

namespace support {

/// Ends the program unless something is mounted over the state folder.
void requirePrivateMounts();

}  // namespace support

#endif  // KELDOAUTH_TESTS_SUPPORT_PRIVATE_MOUNTS_H
