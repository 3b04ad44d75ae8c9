# Where libkeldcore and libkeldcgi come from: the appliance's own, or the
# stand-ins. Defines the targets keld::core and keld::cgi.

if(NOT KELDOAUTH_PLATFORM STREQUAL "standin")
  find_library(KELDCORE_LIBRARY keldcore)
  find_library(KELDCGI_LIBRARY keldcgi)
endif()

if(KELDOAUTH_PLATFORM STREQUAL "system" AND NOT (KELDCORE_LIBRARY AND KELDCGI_LIBRARY))
  message(FATAL_ERROR "KELDOAUTH_PLATFORM is system, but libkeldcore or libkeldcgi is missing")
endif()

if(KELDCORE_LIBRARY AND KELDCGI_LIBRARY AND NOT KELDOAUTH_PLATFORM STREQUAL "standin")
  message(STATUS "Platform libraries: ${KELDCORE_LIBRARY}, ${KELDCGI_LIBRARY}")
  foreach(name core cgi)
    string(TOUPPER ${name} upper)
    add_library(keld::${name} SHARED IMPORTED)
    set_target_properties(keld::${name} PROPERTIES IMPORTED_LOCATION ${KELD${upper}_LIBRARY})
  endforeach()
else()
  message(STATUS "Platform libraries: stand-ins")
  add_subdirectory(platform/standin)
endif()
