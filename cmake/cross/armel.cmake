# 32-bit ARM without a floating-point unit, ARMv5 and up.
set(KELDOAUTH_ARCHITECTURE armel)
set(CMAKE_SYSTEM_PROCESSOR armv5tel)
set(KELDOAUTH_TRIPLE arm-linux-gnueabi)
include(${CMAKE_CURRENT_LIST_DIR}/common.cmake)

set(CMAKE_C_FLAGS_INIT "-Wno-psabi")
set(CMAKE_CXX_FLAGS_INIT "-Wno-psabi")
