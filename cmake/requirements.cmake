# What the parts that are to be built need. All that is missing is said at once,
# with the way to do without it.
# The first that knows synchronous=EXTRA: an older one takes it for NORMAL.
find_package(SQLite3 3.12 QUIET)
find_package(PkgConfig QUIET)

# keldoauth_find(NAME MODULE HEADER): the variables KELDOAUTH_NAME_INCLUDE_DIR and
# _LIBRARY, and _FOUND when both are there. What pkg-config says is a hint and no
# more: unless a toolchain file thinks of it, it speaks of the host's.
macro(keldoauth_find name module header)
  if(PKG_CONFIG_FOUND)
    pkg_check_modules(KELDOAUTH_HINT_${name} QUIET ${module})
  endif()
  find_path(KELDOAUTH_${name}_INCLUDE_DIR ${header}
    HINTS ${KELDOAUTH_HINT_${name}_INCLUDE_DIRS} ${KELDOAUTH_HINT_${name}_INCLUDEDIR}
    PATH_SUFFIXES ${module})
  find_library(KELDOAUTH_${name}_LIBRARY ${module}
    HINTS ${KELDOAUTH_HINT_${name}_LIBRARY_DIRS} ${KELDOAUTH_HINT_${name}_LIBDIR})
  mark_as_advanced(KELDOAUTH_${name}_INCLUDE_DIR KELDOAUTH_${name}_LIBRARY)
  set(KELDOAUTH_${name}_FOUND OFF)
  if(KELDOAUTH_${name}_INCLUDE_DIR AND KELDOAUTH_${name}_LIBRARY)
    set(KELDOAUTH_${name}_FOUND ON)
  endif()
endmacro()

keldoauth_find(JSONCPP jsoncpp json/value.h)
keldoauth_find(NETTLE nettle nettle/siv-cmac.h)
keldoauth_find(HOGWEED hogweed nettle/rsa.h)
find_path(KELDOAUTH_GMP_INCLUDE_DIR gmp.h HINTS ${KELDOAUTH_HINT_HOGWEED_INCLUDE_DIRS})
mark_as_advanced(KELDOAUTH_GMP_INCLUDE_DIR)

set(KELDOAUTH_MISSING "")

# keldoauth_need(FOUND THING PACKAGE [REASON]): FOUND is the name of a variable,
# PACKAGE Debian's word for the thing.
function(keldoauth_need found thing package)
  if(NOT ${found})
    string(JOIN " " line "\n  ${thing} (Debian: ${package})" ${ARGN})
    set(KELDOAUTH_MISSING "${KELDOAUTH_MISSING}${line}" PARENT_SCOPE)
  endif()
endfunction()

keldoauth_need(SQLite3_FOUND "SQLite 3.12" libsqlite3-dev)
keldoauth_need(KELDOAUTH_JSONCPP_FOUND JsonCpp libjsoncpp-dev)
foreach(part TOOLS SERVICE)
  if(KELDOAUTH_${part})
    keldoauth_need(KELDOAUTH_NETTLE_FOUND nettle nettle-dev
      "for KELDOAUTH_${part}, -DKELDOAUTH_${part}=OFF does without")
  endif()
endforeach()
if(KELDOAUTH_PLATFORM STREQUAL "standin")
  keldoauth_need(KELDOAUTH_NETTLE_FOUND nettle nettle-dev
    "for the stand-ins, -DKELDOAUTH_PLATFORM=system does without")
endif()
if(KELDOAUTH_SERVICE)
  if(NOT KELDOAUTH_GMP_INCLUDE_DIR)
    set(KELDOAUTH_HOGWEED_FOUND OFF)
  endif()
  keldoauth_need(KELDOAUTH_HOGWEED_FOUND "nettle's hogweed with GMP" "nettle-dev libgmp-dev"
    "for KELDOAUTH_SERVICE, -DKELDOAUTH_SERVICE=OFF does without")
  find_path(KELDOAUTH_FCGI_INCLUDE_DIR fcgiapp.h)
  find_library(KELDOAUTH_FCGI_LIBRARY NAMES libfcgi.a fcgi)
  mark_as_advanced(KELDOAUTH_FCGI_INCLUDE_DIR KELDOAUTH_FCGI_LIBRARY)
  if(KELDOAUTH_FCGI_INCLUDE_DIR AND KELDOAUTH_FCGI_LIBRARY)
    set(KELDOAUTH_FCGI_FOUND ON)
  endif()
  keldoauth_need(KELDOAUTH_FCGI_FOUND "FastCGI's library" libfcgi-dev
    "for KELDOAUTH_SERVICE, -DKELDOAUTH_SERVICE=OFF does without")
  find_path(KELDOAUTH_CRYPT_INCLUDE_DIR crypt.h)
  find_library(KELDOAUTH_CRYPT_LIBRARY NAMES libcrypt.a crypt)
  mark_as_advanced(KELDOAUTH_CRYPT_INCLUDE_DIR KELDOAUTH_CRYPT_LIBRARY)
  if(KELDOAUTH_CRYPT_INCLUDE_DIR AND KELDOAUTH_CRYPT_LIBRARY)
    set(KELDOAUTH_CRYPT_FOUND ON)
  endif()
  keldoauth_need(KELDOAUTH_CRYPT_FOUND libxcrypt libcrypt-dev
    "for KELDOAUTH_SERVICE, -DKELDOAUTH_SERVICE=OFF does without")
endif()
foreach(part TOOLS SERVICE)
  if(KELDOAUTH_${part})
    find_path(KELDOAUTH_CLI11_INCLUDE_DIR CLI/CLI.hpp)
    mark_as_advanced(KELDOAUTH_CLI11_INCLUDE_DIR)
    keldoauth_need(KELDOAUTH_CLI11_INCLUDE_DIR CLI11 libcli11-dev
      "for KELDOAUTH_${part}, -DKELDOAUTH_${part}=OFF does without")
  endif()
endforeach()

if(KELDOAUTH_POSTGRESQL)
  find_package(PostgreSQL 14 QUIET)
  keldoauth_need(PostgreSQL_FOUND "libpq 14" libpq-dev
    "for KELDOAUTH_POSTGRESQL, -DKELDOAUTH_POSTGRESQL=OFF does without")
endif()

if(KELDOAUTH_MISSING)
  message(FATAL_ERROR "keldoauth: these are missing:${KELDOAUTH_MISSING}")
endif()

if(KELDOAUTH_TESTS AND NOT (BUILD_SHARED_LIBS AND KELDOAUTH_TOOLS AND KELDOAUTH_EXAMPLES
    AND KELDOAUTH_INSTALL))
  message(FATAL_ERROR "KELDOAUTH_TESTS are about the shared library, the command line, the "
    "examples and the installed copy: BUILD_SHARED_LIBS, KELDOAUTH_TOOLS, KELDOAUTH_EXAMPLES and "
    "KELDOAUTH_INSTALL must be on")
endif()
if(KELDOAUTH_TESTS AND CMAKE_CONFIGURATION_TYPES)
  message(FATAL_ERROR "KELDOAUTH_TESTS take a generator of one configuration, as Ninja is")
endif()
