# Install rules: the libraries, the public headers, a CMake package config and a pkg-config file.
include(CMakePackageConfigHelpers)

# Installed libraries find each other beside themselves, wherever the prefix is (a program's
# own run path does not apply to the dependencies of its libraries).
set_target_properties(sarn vek wynbaselib PROPERTIES INSTALL_RPATH "$ORIGIN")
install(TARGETS sarn vek wynbaselib EXPORT sarnTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
  INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(DIRECTORY ${PROJECT_SOURCE_DIR}/platform/vek ${PROJECT_SOURCE_DIR}/platform/wynbaselib
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  FILES_MATCHING PATTERN "*.h" PATTERN "internal" EXCLUDE)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/sarn/core/common/lib/sarn
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  FILES_MATCHING PATTERN "*.h" PATTERN "internal" EXCLUDE)
install(EXPORT sarnTargets NAMESPACE sarn:: DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/sarn)
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/sarnConfig.cmake.in
  ${PROJECT_BINARY_DIR}/sarnConfig.cmake INSTALL_DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/sarn)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/sarnConfigVersion.cmake
  VERSION ${PROJECT_VERSION} COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/sarnConfig.cmake ${PROJECT_BINARY_DIR}/sarnConfigVersion.cmake
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/sarn)
configure_file(${PROJECT_SOURCE_DIR}/cmake/sarn.pc.in ${PROJECT_BINARY_DIR}/sarn.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/sarn.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
