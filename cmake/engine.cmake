# Which engine the store is on is the installation's choice, made at run time
# under the store's own name (engines/choice/). The sources in core/ call SQLite
# and know of no choice: here their calls get the names of the functions that
# choose. Calls that concern no connection stay SQLite's.
#
# By the compiler and not by the linker (--wrap): so it holds for an archive, too,
# whatever its consumers link it with, and for nothing else in their programs.
set(engine_calls)
foreach(call open close exec changes get_autocommit busy_handler)
  list(APPEND engine_calls sqlite3_${call}=keldoauth_engine_${call})
endforeach()
set_property(SOURCE core/connection.cpp core/oauth_db_basic.cpp
  APPEND PROPERTY COMPILE_DEFINITIONS ${engine_calls})
target_sources(keldoauth PRIVATE engines/choice/choice.cpp engines/choice/engine_calls.cpp)
target_link_libraries(keldoauth PRIVATE ${CMAKE_DL_LIBS})
