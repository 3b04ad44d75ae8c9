# 64-bit ARM.
set(KELDOAUTH_ARCHITECTURE arm64)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(KELDOAUTH_TRIPLE aarch64-linux-gnu)
include(${CMAKE_CURRENT_LIST_DIR}/common.cmake)
