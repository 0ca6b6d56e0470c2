# SPDX-License-Identifier: Apache-2.0
# What `./dev install PREFIX` puts where: the shared library, the public headers, and what CMake and pkg-config read.
include(CMakePackageConfigHelpers)

install(TARGETS screenshare EXPORT screenshare)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/screenshare
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} FILES_MATCHING PATTERN "*.h")

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/screenshare)
install(EXPORT screenshare NAMESPACE screenshare:: FILE screenshareConfig.cmake DESTINATION ${package_dir})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/screenshareConfigVersion.cmake
    VERSION ${PROJECT_VERSION} COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/screenshareConfigVersion.cmake DESTINATION ${package_dir})

file(RELATIVE_PATH includes_from_here
    /${CMAKE_INSTALL_LIBDIR}/pkgconfig /${CMAKE_INSTALL_INCLUDEDIR})
configure_file(${CMAKE_CURRENT_LIST_DIR}/screenshare.pc.in ${PROJECT_BINARY_DIR}/screenshare.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/screenshare.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

install(FILES ${PROJECT_SOURCE_DIR}/LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR})
