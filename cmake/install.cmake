# What `cmake --install` puts where. The components are the Debian packages:
# runtime, dev, tools, standin.
include(CMakePackageConfigHelpers)

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/KeldOAuth)

# The platform libraries are not the package's to name: a consumer's linker finds
# them beside the library, or where the system has them.
target_link_options(keldoauth INTERFACE
  $<INSTALL_INTERFACE:-Wl,-rpath-link,$<INSTALL_PREFIX>/${CMAKE_INSTALL_LIBDIR}>)

install(TARGETS keldoauth EXPORT KeldOAuthTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT dev)
if(TARGET keldcore)
  install(TARGETS keldcore keldcgi
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT standin)
endif()

# Headers keep their folders: they are included as "stores/oauth_token.h".
set(public_headers
  utils/oauth_bounds.h utils/oauth_names.h utils/oauth_utils.h
  core/oauth_db_basic.h core/oauth_errors.h
  core/transaction.h
  stores/oauth_clientInfo.h stores/oauth_grantCode.h stores/oauth_log.h stores/oauth_token.h)
foreach(header IN LISTS public_headers)
  cmake_path(GET header PARENT_PATH folder)
  install(FILES ${header} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/keldoauth/${folder} COMPONENT dev)
endforeach()

configure_package_config_file(cmake/KeldOAuthConfig.cmake.in KeldOAuthConfig.cmake
  INSTALL_DESTINATION ${package_dir})
write_basic_package_version_file(KeldOAuthConfigVersion.cmake COMPATIBILITY SameMajorVersion)
file(RELATIVE_PATH KELDOAUTH_PC_TO_PREFIX
  ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig ${CMAKE_INSTALL_PREFIX})
configure_file(cmake/keldoauth.pc.in keldoauth.pc @ONLY)

install(EXPORT KeldOAuthTargets NAMESPACE KeldOAuth:: DESTINATION ${package_dir} COMPONENT dev)
install(FILES
  ${CMAKE_CURRENT_BINARY_DIR}/KeldOAuthConfig.cmake
  ${CMAKE_CURRENT_BINARY_DIR}/KeldOAuthConfigVersion.cmake
  DESTINATION ${package_dir} COMPONENT dev)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/keldoauth.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev)

file(GLOB documents docs/*.md)
# Documents keep their folders, so that they find each other.
install(FILES README.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT dev)
install(FILES ${documents} DESTINATION ${CMAKE_INSTALL_DOCDIR}/docs COMPONENT dev)
install(FILES platform/README.md platform/keldcore.h platform/keldcgi.h
  DESTINATION ${CMAKE_INSTALL_DOCDIR}/platform COMPONENT dev)
install(FILES examples/first_token.cpp examples/first_login.cpp
  DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples COMPONENT dev)
