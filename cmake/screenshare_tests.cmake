# SPDX-License-Identifier: Apache-2.0
include(GoogleTest)

# What the sanitizers are told when a test runs. gtest_discover_tests tears lists apart: one variable a property.
set(sanitizer_properties "")
if(SCREENSHARE_SANITIZE STREQUAL "address")
    string(JOIN ":" asan_options
        detect_leaks=1 detect_stack_use_after_return=1 check_initialization_order=1 strict_string_checks=1
        allocator_may_return_null=1)
    set(sanitizer_properties
        ENVIRONMENT ASAN_OPTIONS=${asan_options}
        ENVIRONMENT_MODIFICATION UBSAN_OPTIONS=set:print_stacktrace=1:halt_on_error=1)
elseif(SCREENSHARE_SANITIZE STREQUAL "thread")
    string(JOIN ":" tsan_options halt_on_error=1 second_deadlock_stack=1 allocator_may_return_null=1)
    set(sanitizer_properties ENVIRONMENT TSAN_OPTIONS=${tsan_options})
endif()

# The programs that the tests of a label run: ./dev test builds LABEL_test_programs, or test_programs for all.
function(screenshare_label_needs LABEL) # PROGRAM...
    if(NOT TARGET ${LABEL}_test_programs)
        add_custom_target(${LABEL}_test_programs)
        add_dependencies(test_programs ${LABEL}_test_programs)
        file(APPEND ${CMAKE_CURRENT_BINARY_DIR}/labels.txt "${LABEL}\n")
    endif()
    add_dependencies(${LABEL}_test_programs ${ARGN})
endfunction()

# screenshare_add_tests(LABEL label [PROGRAM name] [LAYER target] SOURCES pattern...)
#
# One test program, by default LABEL_tests, of every file that a pattern (relative to the current folder) matches, linked
# with the layer that it tests (by default the whole library). Each of its cases becomes a CTest test of its own, in a
# process and a debug folder of its own, under that label. A label whose files do not exist yet makes no program.
function(screenshare_add_tests)
    cmake_parse_arguments(PARSE_ARGV 0 ARG "" "LABEL;PROGRAM;LAYER" "SOURCES")
    list(TRANSFORM ARG_SOURCES PREPEND "${CMAKE_CURRENT_SOURCE_DIR}/" OUTPUT_VARIABLE patterns)
    file(GLOB sources CONFIGURE_DEPENDS ${patterns})
    if(NOT sources)
        return()
    endif()

    if(NOT ARG_LAYER)
        set(ARG_LAYER screenshare_core)
    endif()
    if(NOT ARG_PROGRAM)
        set(ARG_PROGRAM ${ARG_LABEL}_tests)
    endif()
    set(program ${ARG_PROGRAM})
    add_executable(${program} ${sources})
    target_link_libraries(${program} PRIVATE screenshare_tests_support ${ARG_LAYER})
    target_precompile_headers(${program} REUSE_FROM screenshare_tests_support)

    screenshare_label_needs(${ARG_LABEL} ${program})

    set(launcher ${PROJECT_SOURCE_DIR}/scripts/run_test_case)
    if(CMAKE_VERSION VERSION_LESS 3.29)
        set_target_properties(${program} PROPERTIES CROSSCOMPILING_EMULATOR ${launcher})
    else()
        set_target_properties(${program} PROPERTIES TEST_LAUNCHER ${launcher})
    endif()
    gtest_discover_tests(${program}
        DISCOVERY_MODE PRE_TEST
        DISCOVERY_TIMEOUT 120
        NO_PRETTY_VALUES
        NO_PRETTY_TYPES
        PROPERTIES LABELS ${ARG_LABEL} ${sanitizer_properties})
endfunction()

# screenshare_add_script_tests(LABEL label SCRIPT file PROGRAMS target... [ARGUMENTS argument...])
#
# A CTest test for each function case_NAME of a shell script, which is called with the programs' files, the arguments
# and NAME, and ends with 77 when the machine lacks what the case needs.
function(screenshare_add_script_tests)
    cmake_parse_arguments(PARSE_ARGV 0 ARG "" "LABEL;SCRIPT" "PROGRAMS;ARGUMENTS")
    screenshare_label_needs(${ARG_LABEL} ${ARG_PROGRAMS})
    list(TRANSFORM ARG_PROGRAMS REPLACE "(.+)" "$<TARGET_FILE:\\1>" OUTPUT_VARIABLE program_files)
    cmake_path(GET ARG_SCRIPT STEM suite)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${ARG_SCRIPT})
    file(STRINGS ${ARG_SCRIPT} functions REGEX "^case_[a-z0-9_]+\\(\\)")
    foreach(line IN LISTS functions)
        string(REGEX REPLACE "^case_([a-z0-9_]+).*" "\\1" case "${line}")
        add_test(NAME ${suite}.${case}
            COMMAND ${CMAKE_CURRENT_SOURCE_DIR}/${ARG_SCRIPT} ${program_files} ${ARG_ARGUMENTS} ${case})
        set_tests_properties(${suite}.${case} PROPERTIES
            LABELS ${ARG_LABEL} SKIP_RETURN_CODE 77 ${sanitizer_properties})
    endforeach()
endfunction()

# screenshare_add_corpus_test(LABEL label FUZZER name)
#
# A CTest test that hands the seeds fuzz/corpus/NAME to the fuzzer fuzz/NAME_fuzz.cpp, without a fuzzing compiler.
function(screenshare_add_corpus_test)
    cmake_parse_arguments(PARSE_ARGV 0 ARG "" "LABEL;FUZZER" "")
    set(program ${ARG_FUZZER}_replay)
    add_executable(${program} fuzz/replay.cpp fuzz/${ARG_FUZZER}_fuzz.cpp)
    target_include_directories(${program} PRIVATE ${PROJECT_SOURCE_DIR})
    target_link_libraries(${program} PRIVATE screenshare_core)
    screenshare_label_needs(${ARG_LABEL} ${program})
    add_test(NAME ${program} COMMAND ${program} ${CMAKE_CURRENT_SOURCE_DIR}/fuzz/corpus/${ARG_FUZZER})
    set_tests_properties(${program} PROPERTIES LABELS ${ARG_LABEL} ${sanitizer_properties})
endfunction()
