# What somebody sets for all targets of a project, around this one or for their own
# build of it, and these cannot take part in.

# Each source has log numbers of its own under one name: it is a unit by itself.
set(CMAKE_UNITY_BUILD OFF)

# The loader, linkers and the .pc files know the files by their names.
string(TOUPPER "${CMAKE_BUILD_TYPE};${CMAKE_CONFIGURATION_TYPES}" configurations)
foreach(configuration IN LISTS configurations)
  set(CMAKE_${configuration}_POSTFIX "")
endforeach()

# Another project's analysers have rules made for its own sources.
if(NOT KELDOAUTH_IS_TOP_LEVEL)
  foreach(analyser CLANG_TIDY CPPCHECK CPPLINT INCLUDE_WHAT_YOU_USE)
    set(CMAKE_CXX_${analyser} "")
  endforeach()
endif()
