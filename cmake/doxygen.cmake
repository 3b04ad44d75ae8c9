# The reference of the public headers as HTML: the target "docs", where Doxygen
# is installed. A warning is an error.
find_package(Doxygen QUIET)
if(NOT DOXYGEN_FOUND)
  return()
endif()

set(DOXYGEN_PROJECT_BRIEF ${PROJECT_DESCRIPTION})
set(DOXYGEN_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/docs)
set(DOXYGEN_USE_MDFILE_AS_MAINPAGE ${PROJECT_SOURCE_DIR}/docs/reference.md)
set(DOXYGEN_FILTER_PATTERNS "*.h=${PROJECT_SOURCE_DIR}/cmake/doxygen-filter")
set(DOXYGEN_STRIP_FROM_PATH ${PROJECT_SOURCE_DIR})
set(DOXYGEN_QUIET YES)
set(DOXYGEN_WARN_AS_ERROR FAIL_ON_WARNINGS)

# What is there for callers. Names need no comment of their own where the
# heading above them says it all.
set(DOXYGEN_EXTRACT_ALL YES)
set(DOXYGEN_HIDE_UNDOC_RELATIONS YES)
set(DOXYGEN_INHERIT_DOCS NO)
set(DOXYGEN_EXCLUDE_SYMBOLS sqlite3)

# In the order of the headers, which is made for reading.
set(DOXYGEN_SORT_MEMBER_DOCS NO)
set(DOXYGEN_HAVE_DOT NO)
set(DOXYGEN_GENERATE_LATEX NO)

file(GLOB grants_headers RELATIVE ${PROJECT_SOURCE_DIR} grants/*.h)
doxygen_add_docs(docs ${public_headers} ${grants_headers} docs/reference.md
  WORKING_DIRECTORY ${PROJECT_SOURCE_DIR} COMMENT "Writing the reference to docs/html")
