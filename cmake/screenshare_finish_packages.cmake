# SPDX-License-Identifier: Apache-2.0
# Run by CPack on the packages that it made. It has no field to say that the libraries of several architectures may be
# installed side by side, and calls ldconfig from scripts although the trigger does.
foreach(package IN LISTS CPACK_PACKAGE_FILES)
    if(package MATCHES "/libscreenshare")
        set(unpacked ${CPACK_TEMPORARY_DIRECTORY}/finished)
        file(REMOVE_RECURSE ${unpacked})
        execute_process(COMMAND dpkg-deb --raw-extract ${package} ${unpacked} COMMAND_ERROR_IS_FATAL ANY)
        file(REMOVE ${unpacked}/DEBIAN/postinst ${unpacked}/DEBIAN/postrm)
        file(READ ${unpacked}/DEBIAN/control control)
        string(PREPEND control "Multi-Arch: same\n")
        file(WRITE ${unpacked}/DEBIAN/control "${control}")
        execute_process(COMMAND dpkg-deb --root-owner-group -Zxz --build ${unpacked} ${package}
            OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
        file(REMOVE_RECURSE ${unpacked})
    endif()
endforeach()
