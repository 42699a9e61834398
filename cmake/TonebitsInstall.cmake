include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

install(TARGETS tonebits tonebits_host
  EXPORT tonebitsTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
  INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(DIRECTORY ${PROJECT_SOURCE_DIR}/host ${PROJECT_SOURCE_DIR}/tonebits
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  FILES_MATCHING PATTERN "*.h" PATTERN "*_internal.h" EXCLUDE PATTERN "detail" EXCLUDE)
install(EXPORT tonebitsTargets NAMESPACE tonebits::
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/tonebits)
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/tonebitsConfig.cmake.in
  ${PROJECT_BINARY_DIR}/tonebitsConfig.cmake
  INSTALL_DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/tonebits)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/tonebitsConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/tonebitsConfig.cmake ${PROJECT_BINARY_DIR}/tonebitsConfigVersion.cmake
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/tonebits)
