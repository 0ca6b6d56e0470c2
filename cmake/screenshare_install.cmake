# SPDX-License-Identifier: Apache-2.0
# What goes where, in three components: `library` is what a client loads, `development` what it is built with (the
# headers, and what CMake and pkg-config read), `tools` the program. `./dev install PREFIX` puts the first two there.
include(CMakePackageConfigHelpers)

install(TARGETS screenshare EXPORT screenshare
    LIBRARY COMPONENT library NAMELINK_COMPONENT development)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/screenshare
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} COMPONENT development FILES_MATCHING PATTERN "*.h")

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/screenshare)
install(EXPORT screenshare NAMESPACE screenshare:: FILE screenshareConfig.cmake
    DESTINATION ${package_dir} COMPONENT development)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/screenshareConfigVersion.cmake
    VERSION ${PROJECT_VERSION} COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/screenshareConfigVersion.cmake
    DESTINATION ${package_dir} COMPONENT development)

file(RELATIVE_PATH includes_from_here
    /${CMAKE_INSTALL_LIBDIR}/pkgconfig /${CMAKE_INSTALL_INCLUDEDIR})
configure_file(${CMAKE_CURRENT_LIST_DIR}/screenshare.pc.in ${PROJECT_BINARY_DIR}/screenshare.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/screenshare.pc
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)

if(NOT SCREENSHARE_PACKAGES)
    # Packages have their own file about licences, and the text itself is on each Debian system.
    install(FILES ${PROJECT_SOURCE_DIR}/LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT development)
endif()

if(TARGET screenshare_program)
    install(TARGETS screenshare_program RUNTIME COMPONENT tools)
endif()
if(TARGET screenshare_manual)
    set(manual ${PROJECT_BINARY_DIR}/tools/screenshare.1)
    add_custom_command(OUTPUT ${manual}.gz
        COMMAND gzip -9nc ${manual} > ${manual}.gz
        DEPENDS screenshare_manual ${manual})
    add_custom_target(screenshare_packed_manual ALL DEPENDS ${manual}.gz)
    install(FILES ${manual}.gz DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT tools)
    install(FILES ${PROJECT_BINARY_DIR}/tools/screenshare.bash
        DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions COMPONENT tools RENAME screenshare)
endif()
