// Every source of the library includes this header, and no public header does:
// how wide its own time is, is the caller's affair.

#ifndef KELDOAUTH_UTILS_WIDE_TIME_H
#define KELDOAUTH_UTILS_WIDE_TIME_H

#include <sys/types.h>

#include <ctime>

static_assert(sizeof(std::time_t) >= 8,
              "With a 32-bit time_t tokens never expire after 2038: compile with -D_TIME_BITS=64 "
              "-D_FILE_OFFSET_BITS=64, as cmake/wide_time.cmake does");
static_assert(sizeof(off_t) >= 8,
              "With a 32-bit off_t large files cannot be looked at: compile with "
              "-D_FILE_OFFSET_BITS=64, as cmake/wide_time.cmake does");

#endif  // KELDOAUTH_UTILS_WIDE_TIME_H
