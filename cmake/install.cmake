# Installation: the shared library, the public headers, a CMake package giving
# viraduve::viraduve, and a pkg-config file (the command line installs itself from
# tools/cli). Included at the end of the top-level CMakeLists.txt, once the targets exist.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(VIRADUVE_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/viraduve)

install(TARGETS viraduve EXPORT viraduveTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/viraduve
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  FILES_MATCHING PATTERN "*.h")
install(EXPORT viraduveTargets NAMESPACE viraduve:: DESTINATION ${VIRADUVE_CMAKE_DIR})

configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/viraduveConfig.cmake.in
  ${CMAKE_CURRENT_BINARY_DIR}/viraduveConfig.cmake
  INSTALL_DESTINATION ${VIRADUVE_CMAKE_DIR})
# 0.x releases promise nothing across minor versions.
write_basic_package_version_file(${CMAKE_CURRENT_BINARY_DIR}/viraduveConfigVersion.cmake
  VERSION ${PROJECT_VERSION} COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/viraduveConfig.cmake
  ${CMAKE_CURRENT_BINARY_DIR}/viraduveConfigVersion.cmake
  DESTINATION ${VIRADUVE_CMAKE_DIR})

# The pkg-config file finds the prefix from its own place, so an installed tree can move
# (and `cmake --install --prefix` works without reconfiguring).
set(VIRADUVE_PC_DIR ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}")
  set(VIRADUVE_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
else()
  file(RELATIVE_PATH VIRADUVE_PC_UP "/root/${VIRADUVE_PC_DIR}" "/root")
  string(REGEX REPLACE "/$" "" VIRADUVE_PC_UP "${VIRADUVE_PC_UP}")
  set(VIRADUVE_PC_PREFIX "\${pcfiledir}/${VIRADUVE_PC_UP}")
endif()
configure_file(${CMAKE_CURRENT_LIST_DIR}/viraduve.pc.in ${CMAKE_CURRENT_BINARY_DIR}/viraduve.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/viraduve.pc DESTINATION ${VIRADUVE_PC_DIR})
