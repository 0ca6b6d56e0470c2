# SPDX-License-Identifier: Apache-2.0

# screenshare_add_layer(NAME [FOLDERS folder...])
#
# One layer of the library: a static, position independent target made of every .cpp in the named folders
# (by default the current one). Includes are written from the project root ("util/cm_thread.h"), and that root
# is private: linking a layer gives its code, and only targets of this tree see its headers.
function(screenshare_add_layer NAME)
    cmake_parse_arguments(PARSE_ARGV 1 ARG "" "" "FOLDERS")
    if(NOT ARG_FOLDERS)
        set(ARG_FOLDERS .)
    endif()
    list(TRANSFORM ARG_FOLDERS APPEND "/*.cpp" OUTPUT_VARIABLE patterns)
    file(GLOB sources CONFIGURE_DEPENDS ${patterns})
    add_library(${NAME} STATIC ${sources})
    target_include_directories(${NAME} PRIVATE ${PROJECT_SOURCE_DIR})
endfunction()
