// Contract of libkeldcgi, the platform's CGI library, as far as we rely on it.
// The appliance brings the real one; platform/standin/ serves other hosts.

#ifndef KELDOAUTH_PLATFORM_KELDCGI_H
#define KELDOAUTH_PLATFORM_KELDCGI_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

/// Writes the remote address of the current web request (IPv4 dotted form or
/// IPv6 text, possibly with a `%` scope suffix) into the caller's `buffer` of
/// `size` bytes, NUL-terminated. Returns 0 on success, non-zero when there is
/// no request, no address, or no room for it; `buffer` is not to be read then.
int KeldCgiGetRemoteIP(char* buffer, size_t size);

#ifdef __cplusplus
}
#endif

#endif  // KELDOAUTH_PLATFORM_KELDCGI_H
