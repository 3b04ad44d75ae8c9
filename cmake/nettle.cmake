# nettle as an archive, where there is one: what is used of it becomes part of
# the file that uses it, and a process has one library less to find and to load.
# Defines the target keld_nettle unless nettle is missing altogether.
include_guard(GLOBAL)

find_library(NETTLE_ARCHIVE libnettle.a HINTS ${KELDOAUTH_HINT_NETTLE_LIBDIR})
mark_as_advanced(NETTLE_ARCHIVE)

if(KELDOAUTH_NETTLE_FOUND)
  add_library(keld_nettle INTERFACE)
  target_include_directories(keld_nettle SYSTEM INTERFACE ${KELDOAUTH_NETTLE_INCLUDE_DIR})
  if(NETTLE_ARCHIVE)
    target_link_libraries(keld_nettle INTERFACE ${NETTLE_ARCHIVE})
    target_link_options(keld_nettle INTERFACE LINKER:--exclude-libs,libnettle.a)
  else()
    message(STATUS "nettle: no libnettle.a, linking the shared library")
    target_link_libraries(keld_nettle INTERFACE ${KELDOAUTH_NETTLE_LIBRARY})
  endif()
endif()

# Its public-key half, which needs GMP: keld_hogweed, unless one of them is missing.
find_library(HOGWEED_ARCHIVE libhogweed.a HINTS ${KELDOAUTH_HINT_HOGWEED_LIBDIR})
find_library(GMP_ARCHIVE libgmp.a HINTS ${KELDOAUTH_HINT_HOGWEED_LIBDIR})
mark_as_advanced(HOGWEED_ARCHIVE GMP_ARCHIVE)

if(TARGET keld_nettle AND KELDOAUTH_HOGWEED_FOUND AND KELDOAUTH_GMP_INCLUDE_DIR)
  add_library(keld_hogweed INTERFACE)
  target_include_directories(keld_hogweed SYSTEM INTERFACE ${KELDOAUTH_GMP_INCLUDE_DIR})
  if(NETTLE_ARCHIVE AND HOGWEED_ARCHIVE AND GMP_ARCHIVE)
    target_link_libraries(keld_hogweed INTERFACE ${HOGWEED_ARCHIVE} ${GMP_ARCHIVE} keld_nettle)
    target_link_options(keld_hogweed INTERFACE LINKER:--exclude-libs,libhogweed.a:libgmp.a)
  else()
    message(STATUS "nettle: no libhogweed.a or libgmp.a, linking the shared libraries")
    target_link_libraries(keld_hogweed INTERFACE ${KELDOAUTH_HOGWEED_LIBRARY} keld_nettle)
  endif()
endif()
