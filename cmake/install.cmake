# What `cmake --install` puts where. The components are the Debian packages:
# runtime, dev, tools, standin.
include(CMakePackageConfigHelpers)

# Folders may be absolute; the others can be moved together with their prefix.
foreach(name LIBDIR INCLUDEDIR)
  if(IS_ABSOLUTE ${CMAKE_INSTALL_${name}})
    set(exported_${name} ${CMAKE_INSTALL_${name}})
    set(KELDOAUTH_PC_${name} ${CMAKE_INSTALL_${name}})
  else()
    set(exported_${name} $<INSTALL_PREFIX>/${CMAKE_INSTALL_${name}})
    set(KELDOAUTH_PC_${name} "\${prefix}/${CMAKE_INSTALL_${name}}")
  endif()
endforeach()
if(IS_ABSOLUTE ${CMAKE_INSTALL_LIBDIR})
  set(KELDOAUTH_PC_PREFIX ${CMAKE_INSTALL_PREFIX})
else()
  file(RELATIVE_PATH to_prefix ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig ${CMAKE_INSTALL_PREFIX})
  set(KELDOAUTH_PC_PREFIX "\${pcfiledir}/${to_prefix}")
endif()
foreach(name PREFIX LIBDIR INCLUDEDIR)
  string(REPLACE " " "\\ " KELDOAUTH_PC_${name} "${KELDOAUTH_PC_${name}}")
endforeach()
set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/KeldOAuth)

# Inside another project the usual folder of documents is that project's.
set(documents_dir ${CMAKE_INSTALL_DOCDIR})
if(NOT KELDOAUTH_IS_TOP_LEVEL)
  set(documents_dir ${CMAKE_INSTALL_DATAROOTDIR}/doc/keldoauth)
endif()

# The platform libraries are not the package's to name: a consumer's linker finds
# them beside the library, or where the system has them.
target_link_options(keldoauth INTERFACE
  $<INSTALL_INTERFACE:-Wl,-rpath-link,${exported_LIBDIR}>)
if(NOT BUILD_SHARED_LIBS)
  # What an archive needs its consumers link.
  target_link_directories(keldoauth INTERFACE $<INSTALL_INTERFACE:${exported_LIBDIR}>)
  set(KELDOAUTH_PC_REQUIRES " sqlite3")
  set(KELDOAUTH_PC_LIBS " -lkeldcore -lkeldcgi -ldl")
endif()

install(TARGETS keldoauth_headers keldoauth_flavour EXPORT KeldOAuthTargets)
install(TARGETS keldoauth EXPORT KeldOAuthTargets
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT dev
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT dev)
if(TARGET keldcore)
  install(TARGETS keldcore keldcgi
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT standin)
endif()

foreach(header IN LISTS public_headers)
  get_filename_component(folder ${header} DIRECTORY)
  install(FILES ${header} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/keldoauth/${folder} COMPONENT dev)
endforeach()

configure_package_config_file(cmake/KeldOAuthConfig.cmake.in KeldOAuthConfig.cmake
  INSTALL_DESTINATION ${package_dir})
write_basic_package_version_file(KeldOAuthConfigVersion.cmake COMPATIBILITY SameMajorVersion)
configure_file(cmake/keldoauth.pc.in keldoauth.pc @ONLY)

# The static flavour, with the JsonCpp that it was built with.
if(TARGET keldoauth_static)
  target_link_directories(keldoauth_static INTERFACE
    $<INSTALL_INTERFACE:${exported_LIBDIR}>)
  install(TARGETS keldoauth_static EXPORT KeldOAuthStaticTargets
    ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT dev)
  install(FILES ${KELDOAUTH_STATIC_JSONCPP}
    DESTINATION ${CMAKE_INSTALL_LIBDIR} RENAME libkeldoauth_jsoncpp.a COMPONENT dev)
  install(EXPORT KeldOAuthStaticTargets NAMESPACE KeldOAuth::
    DESTINATION ${package_dir} COMPONENT dev)
  # Where it is on the machine that the copy is for.
  string(REPLACE "${CMAKE_SYSROOT}/" "/" KELDOAUTH_PC_JSONCPP ${KELDOAUTH_JSONCPP_INCLUDE_DIR})
  configure_file(cmake/keldoauth-static.pc.in keldoauth-static.pc @ONLY)
  install(FILES ${CMAKE_CURRENT_BINARY_DIR}/keldoauth-static.pc
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev)
endif()

install(EXPORT KeldOAuthTargets NAMESPACE KeldOAuth:: DESTINATION ${package_dir} COMPONENT dev)
install(FILES
  ${CMAKE_CURRENT_BINARY_DIR}/KeldOAuthConfig.cmake
  ${CMAKE_CURRENT_BINARY_DIR}/KeldOAuthConfigVersion.cmake
  DESTINATION ${package_dir} COMPONENT dev)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/keldoauth.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev)

file(GLOB documents CONFIGURE_DEPENDS docs/*.md)
# Documents keep their folders, so that they find each other.
install(FILES README.md CHANGELOG.md LICENSE DESTINATION ${documents_dir} COMPONENT dev)
install(FILES ${documents} DESTINATION ${documents_dir}/docs COMPONENT dev)
install(FILES platform/README.md platform/keldcore.h platform/keldcgi.h
  DESTINATION ${documents_dir}/platform COMPONENT dev)
install(FILES examples/first_token.cpp examples/first_login.cpp
  DESTINATION ${documents_dir}/examples COMPONENT dev)
