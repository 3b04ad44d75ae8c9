# What the parts that are to be built need. All that is missing is said at once,
# with the way to do without it.
# The first that knows synchronous=EXTRA: an older one takes it for NORMAL.
find_package(SQLite3 3.12 QUIET)
find_package(PkgConfig QUIET)
if(PKG_CONFIG_FOUND)
  pkg_check_modules(JSONCPP QUIET IMPORTED_TARGET jsoncpp)
  pkg_check_modules(NETTLE QUIET IMPORTED_TARGET GLOBAL nettle)
endif()

set(KELDOAUTH_MISSING "")

# keldoauth_need(FOUND THING PACKAGE [REASON]): FOUND is the name of a variable,
# PACKAGE Debian's word for the thing.
function(keldoauth_need found thing package)
  if(NOT ${found})
    string(JOIN " " line "\n  ${thing} (Debian: ${package})" ${ARGN})
    set(KELDOAUTH_MISSING "${KELDOAUTH_MISSING}${line}" PARENT_SCOPE)
  endif()
endfunction()

keldoauth_need(PKG_CONFIG_FOUND pkg-config pkg-config)
keldoauth_need(SQLite3_FOUND "SQLite 3.12" libsqlite3-dev)
if(PKG_CONFIG_FOUND)
  keldoauth_need(JSONCPP_FOUND JsonCpp libjsoncpp-dev)
  foreach(part TOOLS SERVICE)
    if(KELDOAUTH_${part})
      keldoauth_need(NETTLE_FOUND nettle nettle-dev
        "for KELDOAUTH_${part}; -DKELDOAUTH_${part}=OFF does without")
    endif()
  endforeach()
endif()
if(KELDOAUTH_SERVICE)
  if(PKG_CONFIG_FOUND)
    pkg_check_modules(HOGWEED QUIET IMPORTED_TARGET GLOBAL hogweed)
    find_path(GMP_INCLUDE_DIR gmp.h HINTS ${HOGWEED_INCLUDE_DIRS})
    mark_as_advanced(GMP_INCLUDE_DIR)
    if(HOGWEED_FOUND AND GMP_INCLUDE_DIR)
      set(KELDOAUTH_HOGWEED_FOUND ON)
    endif()
    keldoauth_need(KELDOAUTH_HOGWEED_FOUND "nettle's hogweed with GMP" "nettle-dev libgmp-dev"
      "for KELDOAUTH_SERVICE; -DKELDOAUTH_SERVICE=OFF does without")
  endif()
  find_path(KELDOAUTH_FCGI_INCLUDE_DIR fcgiapp.h)
  find_library(KELDOAUTH_FCGI_LIBRARY NAMES libfcgi.a fcgi)
  mark_as_advanced(KELDOAUTH_FCGI_INCLUDE_DIR KELDOAUTH_FCGI_LIBRARY)
  if(KELDOAUTH_FCGI_INCLUDE_DIR AND KELDOAUTH_FCGI_LIBRARY)
    set(KELDOAUTH_FCGI_FOUND ON)
  endif()
  keldoauth_need(KELDOAUTH_FCGI_FOUND "FastCGI's library" libfcgi-dev
    "for KELDOAUTH_SERVICE; -DKELDOAUTH_SERVICE=OFF does without")
  find_path(KELDOAUTH_CRYPT_INCLUDE_DIR crypt.h)
  find_library(KELDOAUTH_CRYPT_LIBRARY NAMES libcrypt.a crypt)
  mark_as_advanced(KELDOAUTH_CRYPT_INCLUDE_DIR KELDOAUTH_CRYPT_LIBRARY)
  if(KELDOAUTH_CRYPT_INCLUDE_DIR AND KELDOAUTH_CRYPT_LIBRARY)
    set(KELDOAUTH_CRYPT_FOUND ON)
  endif()
  keldoauth_need(KELDOAUTH_CRYPT_FOUND libxcrypt libcrypt-dev
    "for KELDOAUTH_SERVICE; -DKELDOAUTH_SERVICE=OFF does without")
endif()
foreach(part TOOLS SERVICE)
  if(KELDOAUTH_${part})
    find_path(KELDOAUTH_CLI11_INCLUDE_DIR CLI/CLI.hpp)
    mark_as_advanced(KELDOAUTH_CLI11_INCLUDE_DIR)
    keldoauth_need(KELDOAUTH_CLI11_INCLUDE_DIR CLI11 libcli11-dev
      "for KELDOAUTH_${part}; -DKELDOAUTH_${part}=OFF does without")
  endif()
endforeach()

if(KELDOAUTH_POSTGRESQL)
  find_package(PostgreSQL 14 QUIET)
  keldoauth_need(PostgreSQL_FOUND "libpq 14" libpq-dev
    "for KELDOAUTH_POSTGRESQL; -DKELDOAUTH_POSTGRESQL=OFF does without")
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
