# 64-bit and big-endian: shows what relies on the order of bytes.
set(KELDOAUTH_ARCHITECTURE s390x)
set(CMAKE_SYSTEM_PROCESSOR s390x)
set(KELDOAUTH_TRIPLE s390x-linux-gnu)
include(${CMAKE_CURRENT_LIST_DIR}/common.cmake)
