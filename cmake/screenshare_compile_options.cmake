# SPDX-License-Identifier: Apache-2.0
# How everything in this project is compiled, whatever the target.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)

# We live inside other people's processes: what is not exported by name stays invisible to them.
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)

add_compile_options(-Wall -Wextra -Wpedantic -Wshadow -Wconversion)
if(CMAKE_CXX_COMPILER_ID MATCHES "Clang")
    # clang counts sign changes to -Wconversion, g++ does not; one rule for both.
    add_compile_options(-Wno-sign-conversion)
endif()

if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_GREATER_EQUAL 12)
    # Otherwise an atomic member behind a pointer that is compared with null somewhere counts as an overflow.
    add_compile_options(--param=min-pagesize=0)
endif()

# Trace lines name their source place from the project root, on whatever machine they were built.
add_compile_options(-ffile-prefix-map=${PROJECT_SOURCE_DIR}/=)

# The linker places some functions by name (src/tick_functions.ld).
add_compile_options(-ffunction-sections)

# All is bound at load time, so calls of other libraries need no stubs in between. A tick that has been out of the
# processor's caches reads each page that it goes through anew.
add_compile_options(-fno-plt)

if(SCREENSHARE_SANITIZE STREQUAL "address")
    set(sanitizer_options -fsanitize=address,undefined,float-cast-overflow -fno-sanitize-recover=all)
elseif(SCREENSHARE_SANITIZE STREQUAL "thread")
    set(sanitizer_options -fsanitize=thread)
elseif(SCREENSHARE_SANITIZE)
    message(FATAL_ERROR "SCREENSHARE_SANITIZE is '${SCREENSHARE_SANITIZE}': expected 'address', 'thread' or nothing")
endif()
if(SCREENSHARE_SANITIZE)
    add_compile_options(${sanitizer_options} -fno-omit-frame-pointer)
    add_link_options(${sanitizer_options})
endif()

# What is shipped makes flaws harder to use. Only where the optimiser runs, without which the C library can't check
# lengths, and not under sanitizers, which look closer.
include(CheckCXXCompilerFlag)
set(hardening_compile_options -fstack-protector-strong -Wformat -Werror=format-security)
if(NOT CMAKE_CXX_FLAGS MATCHES "_FORTIFY_SOURCE") # who packs it may have asked for more
    list(APPEND hardening_compile_options -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2)
endif()
foreach(option IN ITEMS -fstack-clash-protection -fcf-protection) # not on every processor
    string(MAKE_C_IDENTIFIER "SCREENSHARE_HAS${option}" has_option)
    check_cxx_compiler_flag(${option} ${has_option})
    if(${has_option})
        list(APPEND hardening_compile_options ${option})
    endif()
endforeach()
set(hardening_link_options -Wl,-z,relro -Wl,-z,now -Wl,-z,noexecstack)

# screenshare_harden(NAME)
#
# For each target that has a part in the shared library or the program.
function(screenshare_harden NAME)
    if(SCREENSHARE_SANITIZE OR SCREENSHARE_FUZZ)
        return()
    endif()
    set(optimised "$<CONFIG:Release,RelWithDebInfo,MinSizeRel>")
    target_compile_options(${NAME} PRIVATE "$<${optimised}:${hardening_compile_options}>")
    get_target_property(type ${NAME} TYPE)
    if(type STREQUAL "EXECUTABLE")
        target_link_options(${NAME} PRIVATE "$<${optimised}:-pie;${hardening_link_options}>")
    elseif(type STREQUAL "SHARED_LIBRARY")
        target_link_options(${NAME} PRIVATE "$<${optimised}:${hardening_link_options}>")
    endif()
endfunction()

if(SCREENSHARE_FUZZ)
    # Coverage feedback for the whole library; the fuzzers themselves add the driver.
    add_compile_options(-fsanitize=fuzzer-no-link)
endif()

find_program(SCREENSHARE_CCACHE_PROGRAM ccache)
mark_as_advanced(SCREENSHARE_CCACHE_PROGRAM)
if(SCREENSHARE_CCACHE AND SCREENSHARE_CCACHE_PROGRAM)
    set(CMAKE_CXX_COMPILER_LAUNCHER ${SCREENSHARE_CCACHE_PROGRAM})
endif()
