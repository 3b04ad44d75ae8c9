# libkeldoauth as a shared library: what it shows, and that it stays.
set_target_properties(keldoauth PROPERTIES LINK_DEPENDS
  "${PROJECT_SOURCE_DIR}/cmake/dynamic.list;${PROJECT_SOURCE_DIR}/cmake/exports.map")
target_link_options(keldoauth PRIVATE
  LINKER:--version-script=${PROJECT_SOURCE_DIR}/cmake/exports.map LINKER:--no-undefined
  LINKER:--dynamic-list=${PROJECT_SOURCE_DIR}/cmake/dynamic.list)
# Documents that it has handed out refer to names inside it.
target_link_options(keldoauth PRIVATE LINKER:-z,nodelete)

# A consumer's linker finds the platform libraries beside it.
target_link_options(keldoauth INTERFACE
  $<BUILD_INTERFACE:LINKER:-rpath-link,$<TARGET_FILE_DIR:keldoauth>>)
