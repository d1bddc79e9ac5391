# Says where cmake --install puts each file. The stand-ins for the host's libraries are for
# development machines only. This installs them: cmake --install BUILD --component standins

include(CMakePackageConfigHelpers)
include(GNUInstallDirs)

set(header_folder ${CMAKE_INSTALL_INCLUDEDIR}/zevooauth)
set(config_folder ${CMAKE_INSTALL_LIBDIR}/cmake/ZevoOAuth)
set(pkgconfig_folder ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

install(TARGETS zevooauth EXPORT ZevoOAuthTargets
  LIBRARY COMPONENT runtime NAMELINK_COMPONENT development
  INCLUDES DESTINATION ${header_folder})
install_without_run_path(zevooauth ${CMAKE_INSTALL_LIBDIR} runtime)
install(DIRECTORY include/ DESTINATION ${header_folder} COMPONENT development
  FILES_MATCHING PATTERN *.h)

configure_package_config_file(cmake/ZevoOAuthConfig.cmake.in ZevoOAuthConfig.cmake
  INSTALL_DESTINATION ${config_folder} NO_SET_AND_CHECK_MACRO)
write_basic_package_version_file(ZevoOAuthConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(EXPORT ZevoOAuthTargets
  NAMESPACE ZevoOAuth:: DESTINATION ${config_folder} COMPONENT development)
install(FILES
  ${PROJECT_BINARY_DIR}/ZevoOAuthConfig.cmake ${PROJECT_BINARY_DIR}/ZevoOAuthConfigVersion.cmake
  DESTINATION ${config_folder} COMPONENT development)

# The prefix is relative to zevooauth.pc, so that the tree may lie anywhere, also with --prefix.
file(RELATIVE_PATH prefix_from_pkgconfig /${pkgconfig_folder} /)
string(REGEX REPLACE "/$" "" prefix_from_pkgconfig ${prefix_from_pkgconfig})
configure_file(cmake/zevooauth.pc.in zevooauth.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/zevooauth.pc
  DESTINATION ${pkgconfig_folder} COMPONENT development)

# Some files belong to the checkout and are not installed: the example server and its page, the page
# about performance, and the front pages of the documents.
install(DIRECTORY docs examples DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT documentation
  FILES_MATCHING PATTERN *.md PATTERN *.svg PATTERN lifecycle.cpp PATTERN authserver* EXCLUDE
  PATTERN performance.* EXCLUDE PATTERN overview.svg EXCLUDE PATTERN mainpage.md EXCLUDE)
install(FILES CHANGELOG.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT documentation)

if(ZEVOOAUTH_BUILD_TOOLS)
  install(TARGETS oauthctl RUNTIME COMPONENT oauthctl)
  install_without_run_path(oauthctl ${CMAKE_INSTALL_BINDIR} oauthctl)
  install(FILES tools/oauthctl/oauthctl.1
    DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT oauthctl)
  install(FILES tools/oauthctl/oauthctl.bash RENAME oauthctl
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions COMPONENT oauthctl)
endif()

install(TARGETS zevocore zevocgi
  LIBRARY NAMELINK_SKIP COMPONENT standins EXCLUDE_FROM_ALL)
foreach(stand_in zevocore zevocgi)
  install_without_run_path(${stand_in} ${CMAKE_INSTALL_LIBDIR} standins EXCLUDE_FROM_ALL)
endforeach()
