# SPDX-License-Identifier: Apache-2.0

# screenshare_join_sources(NAME)
#
# Has the target's sources compiled several at a time, if such is wanted: most of the time goes into the headers that
# they share. Names in their unnamed namespaces must differ then.
function(screenshare_join_sources NAME)
    if(NOT SCREENSHARE_JOIN_SOURCES STREQUAL "all" AND NOT NAME IN_LIST SCREENSHARE_JOIN_SOURCES)
        return()
    endif()
    set_target_properties(${NAME} PROPERTIES UNITY_BUILD ON UNITY_BUILD_BATCH_SIZE 10)
    if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
        # The file that g++ reads is not the one that an unnamed namespace is in.
        target_compile_options(${NAME} PRIVATE -Wno-subobject-linkage)
    endif()
endfunction()

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
    screenshare_join_sources(${NAME})
    screenshare_harden(${NAME})
    target_include_directories(${NAME} PRIVATE ${PROJECT_SOURCE_DIR})
endfunction()
