# The two flavours of the library. Who links libkeldoauth gets what its packages
# bring and mend, SQLite among it, which must be in a process once. A program that
# is started for one request takes keldoauth_static instead: with the library,
# JsonCpp, SQLite and libstdc++ in the program, the loader, which is most of such a
# start, has only libc and the two platform libraries to load.
#
# Debian has no archive of JsonCpp: scripts/static-jsoncpp makes one. Without it,
# or without libsqlite3.a, there is no static flavour; nor where keldoauth itself is
# built as an archive, for others to link as they like.
set(KELDOAUTH_STATIC_JSONCPP "" CACHE FILEPATH
    "libjsoncpp.a for the static flavour, from scripts/static-jsoncpp")
option(KELDOAUTH_STATIC_PROGRAMS
       "Link the command line and the service with the static flavour" OFF)
find_library(SQLITE3_ARCHIVE libsqlite3.a)
mark_as_advanced(SQLITE3_ARCHIVE)

if(KELDOAUTH_STATIC_JSONCPP AND SQLITE3_ARCHIVE AND BUILD_SHARED_LIBS)
  # The very same code: position-independent, as a library's has to be.
  add_library(keldoauth_static STATIC $<TARGET_OBJECTS:keldoauth>)
  add_library(KeldOAuth::keldoauth_static ALIAS keldoauth_static)
  set_target_properties(keldoauth_static PROPERTIES
    OUTPUT_NAME keldoauth
    LINKER_LANGUAGE CXX
    INTERFACE_POSITION_INDEPENDENT_CODE ON)
  target_link_libraries(keldoauth_static INTERFACE
    keldoauth_headers
    "$<BUILD_INTERFACE:${KELDOAUTH_STATIC_JSONCPP};${SQLITE3_ARCHIVE};keld::core;keld::cgi>"
    "$<INSTALL_INTERFACE:KeldOAuth::jsoncpp_archive;KeldOAuth::sqlite_archive;-lkeldcore;-lkeldcgi>"
    m ${CMAKE_DL_LIBS})
  target_link_options(keldoauth_static INTERFACE
    -static-libstdc++ -static-libgcc LINKER:--gc-sections LINKER:-z,relro LINKER:-z,now)
elseif(KELDOAUTH_STATIC_PROGRAMS)
  message(FATAL_ERROR
    "KELDOAUTH_STATIC_PROGRAMS takes libsqlite3.a and KELDOAUTH_STATIC_JSONCPP")
endif()

# What a program links who leaves the choice to its property KELDOAUTH_STATIC. What
# the library of a program links must be this, never one of the two: that both
# end up in one process is refused below.
set(is_static $<BOOL:$<TARGET_PROPERTY:KELDOAUTH_STATIC>>)
add_library(keldoauth_flavour INTERFACE)
add_library(KeldOAuth::flavour ALIAS keldoauth_flavour)
set_target_properties(keldoauth_flavour PROPERTIES EXPORT_NAME flavour)
target_link_libraries(keldoauth_flavour INTERFACE
  $<${is_static}:KeldOAuth::keldoauth_static> $<$<NOT:${is_static}>:KeldOAuth::keldoauth>)

# The same for programs of this tree that call SQLite themselves.
add_library(keldoauth_and_sqlite INTERFACE)
target_link_libraries(keldoauth_and_sqlite INTERFACE
  keldoauth_flavour $<$<NOT:${is_static}>:SQLite::SQLite3>)

foreach(flavour keldoauth keldoauth_static)
  if(TARGET ${flavour})
    set_target_properties(${flavour} PROPERTIES INTERFACE_KELDOAUTH_FLAVOUR ${flavour})
    set_property(TARGET ${flavour} APPEND PROPERTY
      COMPATIBLE_INTERFACE_STRING KELDOAUTH_FLAVOUR)
  endif()
endforeach()
