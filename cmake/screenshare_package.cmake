# SPDX-License-Identifier: Apache-2.0
# One Debian package a component. CPack makes them from what is installed, so that no list of files stands twice.
set(revision 1)
set(version ${PROJECT_VERSION}-${revision})
set(maintainer "screenshare developers <screenshare@localhost>")

set(library_package libscreenshare${SCREENSHARE_INTERFACE_VERSION})
set(development_package libscreenshare-dev)
set(tools_package screenshare-tools)

# ---- what only packages bring: each its own copyright file and changelogs

# Of the commit, so that the same commit makes the same bytes.
string(TIMESTAMP date "%a, %d %b %Y %H:%M:%S +0000" UTC)
set(package_files ${PROJECT_BINARY_DIR}/packaging)
file(CONFIGURE OUTPUT ${package_files}/changelog.Debian @ONLY CONTENT
"screenshare (@version@) unstable; urgency=medium

  * Packages of screenshare @PROJECT_VERSION@. What changed stands in changelog.gz.

 -- @maintainer@  @date@
")
configure_file(${PROJECT_SOURCE_DIR}/CHANGELOG.md ${package_files}/changelog COPYONLY)
foreach(name IN ITEMS changelog changelog.Debian)
    add_custom_command(OUTPUT ${package_files}/${name}.gz
        COMMAND gzip -9nc ${package_files}/${name} > ${package_files}/${name}.gz
        DEPENDS ${package_files}/${name})
endforeach()
add_custom_target(screenshare_package_files ALL
    DEPENDS ${package_files}/changelog.gz ${package_files}/changelog.Debian.gz)

foreach(component IN ITEMS library development tools)
    set(folder ${CMAKE_INSTALL_DATADIR}/doc/${${component}_package})
    install(FILES ${PROJECT_SOURCE_DIR}/packaging/copyright.txt
        DESTINATION ${folder} COMPONENT ${component} RENAME copyright)
    install(FILES ${package_files}/changelog.gz ${package_files}/changelog.Debian.gz
        DESTINATION ${folder} COMPONENT ${component})
endforeach()
install(DIRECTORY ${PROJECT_SOURCE_DIR}/examples/minimal_client
    DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${development_package}/examples COMPONENT development
    PATTERN "*.sh" PERMISSIONS
        OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)

# ---- what all packages share

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME screenshare)
set(CPACK_PACKAGE_CONTACT ${maintainer})
set(CPACK_PACKAGING_INSTALL_PREFIX ${CMAKE_INSTALL_PREFIX})
set(CPACK_COMPONENTS_ALL library development tools)
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_STRIP_FILES ON)
set(CPACK_POST_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/screenshare_finish_packages.cmake)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_RELEASE ${revision})
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_COMPRESSION_TYPE xz)
set(about "screenshare captures monitors, applications and windows for a conferencing
client, and keeps out of the pictures what is not shared.")

# ---- each package

# What a client's own package has to depend on, and how the loader comes to know the library.
file(WRITE ${package_files}/shlibs
    "libscreenshare ${SCREENSHARE_INTERFACE_VERSION} ${library_package} (>= ${PROJECT_VERSION})\n")
file(WRITE ${package_files}/triggers "activate-noawait ldconfig\n")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA ${package_files}/shlibs ${package_files}/triggers)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME ${library_package})
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_COMPONENT_LIBRARY_DESCRIPTION "screen-share capture library
${about}
.
This package has the shared library.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME ${development_package})
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "${library_package} (= ${version})")
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "screen-share capture library, for building clients
${about}
.
This package has the headers, what CMake and pkg-config read, and a small
client to start from.")

# The program holds the library's code itself.
set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME ${tools_package})
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION video)
set(CPACK_COMPONENT_TOOLS_DESCRIPTION "screen-share capture on the command line
${about}
.
This package has the program screenshare: it lists what can be shared,
captures it into files, draws what viewers would see, and tells what is
wrong on a desktop where sharing does not work.")

include(CPack)
