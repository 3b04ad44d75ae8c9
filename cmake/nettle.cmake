# nettle as an archive, where there is one: what is used of it becomes part of
# the file that uses it, and a process has one library less to find and to load.
# Defines the target keld_nettle unless nettle is missing altogether.
include_guard(GLOBAL)

pkg_check_modules(NETTLE IMPORTED_TARGET GLOBAL nettle)
find_library(NETTLE_ARCHIVE libnettle.a HINTS ${NETTLE_LIBRARY_DIRS})
mark_as_advanced(NETTLE_ARCHIVE)

if(NETTLE_FOUND)
  add_library(keld_nettle INTERFACE)
  if(NETTLE_ARCHIVE)
    target_include_directories(keld_nettle SYSTEM INTERFACE ${NETTLE_INCLUDE_DIRS})
    target_link_libraries(keld_nettle INTERFACE ${NETTLE_ARCHIVE})
    target_link_options(keld_nettle INTERFACE LINKER:--exclude-libs,libnettle.a)
  else()
    message(STATUS "nettle: no libnettle.a, linking the shared library")
    target_link_libraries(keld_nettle INTERFACE PkgConfig::NETTLE)
  endif()
endif()

# Its public-key half, which needs GMP: keld_hogweed, unless one of them is missing.
pkg_check_modules(HOGWEED QUIET IMPORTED_TARGET GLOBAL hogweed)
find_library(HOGWEED_ARCHIVE libhogweed.a HINTS ${HOGWEED_LIBRARY_DIRS})
find_library(GMP_ARCHIVE libgmp.a HINTS ${HOGWEED_LIBRARY_DIRS})
find_path(GMP_INCLUDE_DIR gmp.h HINTS ${HOGWEED_INCLUDE_DIRS})
mark_as_advanced(HOGWEED_ARCHIVE GMP_ARCHIVE GMP_INCLUDE_DIR)

if(TARGET keld_nettle AND HOGWEED_FOUND AND GMP_INCLUDE_DIR)
  add_library(keld_hogweed INTERFACE)
  target_include_directories(keld_hogweed SYSTEM INTERFACE ${GMP_INCLUDE_DIR})
  if(NETTLE_ARCHIVE AND HOGWEED_ARCHIVE AND GMP_ARCHIVE)
    target_link_libraries(keld_hogweed INTERFACE ${HOGWEED_ARCHIVE} ${GMP_ARCHIVE} keld_nettle)
    target_link_options(keld_hogweed INTERFACE LINKER:--exclude-libs,libhogweed.a:libgmp.a)
  else()
    message(STATUS "nettle: no libhogweed.a or libgmp.a, linking the shared libraries")
    target_link_libraries(keld_hogweed INTERFACE PkgConfig::HOGWEED keld_nettle)
  endif()
endif()
