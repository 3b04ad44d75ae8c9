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
