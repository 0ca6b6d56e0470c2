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

# screenshare_join_tests(PROGRAM RESULT SOURCE...)
#
# Ten test sources are compiled as one: most of the time goes into headers and templates that all of them share. They
# keep out of each other's way, each in a namespace of its own, behind the headers of all. RESULT becomes the list of
# what is to be compiled. What opens a namespace or is the program's own beyond its cases stays as it is, and so does
# what is compiled with options of its own. How a type is printed has to be told where the type is.
set(SCREENSHARE_TESTS_TOGETHER 10)
set(SCREENSHARE_TESTS_ALONE "^namespace [a-z0-9_:]+ {|^extern \"C\"|^#if|^void\\*? .*operator (new|delete)")

function(screenshare_join_tests PROGRAM RESULT)
    set(compiled "")
    set(together "")
    foreach(source IN LISTS ARGN)
        get_source_file_property(options ${source} COMPILE_OPTIONS)
        file(STRINGS ${source} alone REGEX "${SCREENSHARE_TESTS_ALONE}")
        if(options OR alone OR NOT source MATCHES "_test\\.cpp$")
            list(APPEND compiled ${source})
        else()
            list(APPEND together ${source})
        endif()
    endforeach()
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${together})
    while(together)
        list(SUBLIST together 0 ${SCREENSHARE_TESTS_TOGETHER} sources)
        list(REMOVE_ITEM together ${sources})
        set(headers "")
        set(bodies "")
        foreach(source IN LISTS sources)
            file(STRINGS ${source} includes REGEX "^#include")
            list(APPEND headers ${includes})
            cmake_path(GET source STEM name)
            string(APPEND bodies "namespace in_${name} {\n#include \"${source}\"\n}\n")
        endforeach()
        list(REMOVE_DUPLICATES headers)
        list(JOIN headers "\n" headers)
        list(LENGTH together rest)
        set(joined ${CMAKE_CURRENT_BINARY_DIR}/${PROGRAM}_${rest}.cpp)
        file(CONFIGURE OUTPUT ${joined} CONTENT "${headers}\n${bodies}" @ONLY)
        if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
            # The file that g++ reads is not the one that the unnamed namespaces are in.
            set_source_files_properties(${joined} PROPERTIES COMPILE_OPTIONS -Wno-subobject-linkage)
        endif()
        list(APPEND compiled ${joined})
    endwhile()
    set(${RESULT} ${compiled} PARENT_SCOPE)
endfunction()

# screenshare_add_parts(PROGRAM LABEL LAUNCHER)
#
# A few CTest tests that share a program's cases out among them, many in a process.
set(SCREENSHARE_PARTS 4)

function(screenshare_add_parts PROGRAM LABEL LAUNCHER)
    math(EXPR last "${SCREENSHARE_PARTS} - 1")
    foreach(part RANGE ${last})
        set(name ${PROGRAM}.part_${part}_of_${SCREENSHARE_PARTS})
        add_test(NAME ${name} COMMAND ${LAUNCHER} $<TARGET_FILE:${PROGRAM}> --gtest_filter=*)
        set_tests_properties(${name} PROPERTIES LABELS ${LABEL} ${sanitizer_properties})
        set_property(TEST ${name} APPEND PROPERTY ENVIRONMENT
            GTEST_TOTAL_SHARDS=${SCREENSHARE_PARTS} GTEST_SHARD_INDEX=${part})
    endforeach()
endfunction()

# screenshare_add_tests(LABEL label [PROGRAM name] [LAYER target] [TOGETHER] SOURCES pattern... [ONE_THREAD pattern...])
#
# One test program, by default LABEL_tests, of every file that a pattern (relative to the current folder) matches, linked
# with the layer that it tests (by default the whole library). Each of its cases becomes a CTest test of its own, in a
# process and a debug folder of its own, under that label. A label whose files do not exist yet makes no program.
#
# The cases of a program that is TOGETHER get along in one process, too, and under a sanitizer they have to: there a
# process takes longer to start than most cases run.
#
# Sources that are ONE_THREAD have nothing to show to ThreadSanitizer, whose builds and runs take long.
function(screenshare_add_tests)
    cmake_parse_arguments(PARSE_ARGV 0 ARG "TOGETHER" "LABEL;PROGRAM;LAYER" "SOURCES;ONE_THREAD")
    list(TRANSFORM ARG_SOURCES PREPEND "${CMAKE_CURRENT_SOURCE_DIR}/" OUTPUT_VARIABLE patterns)
    file(GLOB sources CONFIGURE_DEPENDS ${patterns})
    if(ARG_ONE_THREAD AND SCREENSHARE_SANITIZE STREQUAL "thread")
        list(TRANSFORM ARG_ONE_THREAD PREPEND "${CMAKE_CURRENT_SOURCE_DIR}/" OUTPUT_VARIABLE patterns)
        file(GLOB left_out CONFIGURE_DEPENDS ${patterns})
        list(REMOVE_ITEM sources ${left_out})
    endif()
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
    if(SCREENSHARE_JOIN_SOURCES)
        screenshare_join_tests(${program} sources ${sources})
    endif()
    add_executable(${program} ${sources})
    target_link_libraries(${program} PRIVATE screenshare_tests_support ${ARG_LAYER})
    target_precompile_headers(${program} REUSE_FROM screenshare_tests_support)

    screenshare_label_needs(${ARG_LABEL} ${program})
    file(APPEND ${CMAKE_CURRENT_BINARY_DIR}/programs.txt "${program} ${ARG_LABEL} ${ARG_LAYER}\n") # For scripts/mutate.

    set(launcher ${PROJECT_SOURCE_DIR}/scripts/run_test_case)
    if(ARG_TOGETHER AND SCREENSHARE_SANITIZE)
        screenshare_add_parts(${program} ${ARG_LABEL} ${launcher})
        return()
    endif()
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
