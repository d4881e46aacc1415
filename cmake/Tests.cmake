# Test programs: one for each folder of tests, one ctest entry for each test case.

find_package(GTest REQUIRED)
include(GoogleTest)

# What sanitizers look at is optimised as far as their manuals advise. Optimising the tests as well would take longer than
# running them.
set(_test_optimisation)
if(CLIPFILE_SANITIZE)
    set(_test_optimisation -O0)
endif()

if(CLIPFILE_TEST_PCH)
    add_library(clipfile_test_pch OBJECT "${CMAKE_CURRENT_LIST_DIR}/test_pch.cc")
    target_link_libraries(clipfile_test_pch PRIVATE clipfile_common GTest::gmock)
    # As CMake compiles programs: headers precompiled for a library would be refused.
    set_target_properties(clipfile_test_pch PROPERTIES POSITION_INDEPENDENT_CODE OFF)
    target_compile_options(clipfile_test_pch PRIVATE -fPIE ${_test_optimisation})
    target_precompile_headers(clipfile_test_pch PRIVATE
        <gmock/gmock.h> <gtest/gtest.h>
        <algorithm> <array> <atomic> <condition_variable> <cstdint> <cstdio> <cstring> <deque>
        <functional> <map> <memory> <mutex> <string> <string_view> <thread> <vector>)
endif()

# clipfile_add_test(NAME SOURCES x_test.cc ... [LIBRARIES ...] [TIMEOUT seconds] [ENVIRONMENT A=b ...] [SERIAL]
#                   [FILTER pattern] [UNSANITIZED] [SINGLE_THREADED] [POOLED] [ONLY_IF variable])
#
# Registers the sources, builds the program NAME from them and enters each of its cases with ctest. A *_test.cc
# that no call names fails the configure step (clipfile_check_tests_registered). SERIAL is for measurements of a
# whole process (memory, open files); everything else runs in parallel. Of a FILTER, in the form of --gtest_filter, only
# the cases that it matches are entered. UNSANITIZED leaves the program out of builds with sanitizers: what it watches
# is another process, or memory that a sanitizer changes. SINGLE_THREADED leaves it out of builds with the thread
# sanitizer, which would find nothing in it and takes minutes to build it. Cases that are POOLED leave nothing behind in their process:
# under sanitizers, where the start of a process takes longer than most of them, four processes share them. ONLY_IF leaves it out where the variable is
# false, since what it tests is not built there.
function(clipfile_add_test name)
    cmake_parse_arguments(ARG "SERIAL;UNSANITIZED;SINGLE_THREADED;POOLED" "TIMEOUT;FILTER;ONLY_IF" "SOURCES;LIBRARIES;ENVIRONMENT" ${ARGN})
    if(ARG_UNPARSED_ARGUMENTS OR NOT ARG_SOURCES)
        message(FATAL_ERROR "clipfile_add_test(${name}): SOURCES are missing or '${ARG_UNPARSED_ARGUMENTS}' is not understood.")
    endif()
    list(TRANSFORM ARG_SOURCES PREPEND "${CMAKE_CURRENT_SOURCE_DIR}/" OUTPUT_VARIABLE paths)
    set_property(GLOBAL APPEND PROPERTY CLIPFILE_REGISTERED_TESTS ${paths})
    if(ARG_ONLY_IF AND NOT ${ARG_ONLY_IF})
        return()
    endif()
    if(ARG_UNSANITIZED AND CLIPFILE_SANITIZE)
        return()
    endif()
    if(ARG_SINGLE_THREADED AND CLIPFILE_SANITIZE STREQUAL "thread")
        return()
    endif()
    if(NOT ARG_TIMEOUT)
        set(ARG_TIMEOUT 60)
    endif()
    if(CLIPFILE_SANITIZE)
        math(EXPR ARG_TIMEOUT "${ARG_TIMEOUT} * 4")
    endif()

    add_executable(${name} ${ARG_SOURCES})
    target_link_libraries(${name} PRIVATE clipfile_common ${ARG_LIBRARIES} GTest::gmock_main)
    # GCC 12, when it optimises, sees writes past the end wherever vectors and strings are put together in one expression,
    # as tests like to do.
    target_compile_options(${name} PRIVATE ${_test_optimisation}
        "$<$<AND:$<CXX_COMPILER_ID:GNU>,$<VERSION_LESS:$<CXX_COMPILER_VERSION>,13>>:-Wno-array-bounds;-Wno-stringop-overflow;-Wno-stringop-overread>")
    if(CLIPFILE_TEST_PCH)
        target_precompile_headers(${name} REUSE_FROM clipfile_test_pch)
    endif()
    set(properties TIMEOUT ${ARG_TIMEOUT})
    if(ARG_SERIAL)
        list(APPEND properties RUN_SERIAL ON)
    endif()
    if(ARG_ENVIRONMENT)
        list(APPEND properties ENVIRONMENT "${ARG_ENVIRONMENT}")
    endif()
    if(ARG_POOLED AND ARG_FILTER)
        message(FATAL_ERROR "clipfile_add_test(${name}): POOLED takes no FILTER.")
    endif()
    if(ARG_POOLED AND CLIPFILE_SANITIZE)
        foreach(pool RANGE 0 3)
            add_test(NAME ${name}.pool${pool} COMMAND ${name})
            set_tests_properties(${name}.pool${pool} PROPERTIES ${properties}
                ENVIRONMENT "GTEST_TOTAL_SHARDS=4;GTEST_SHARD_INDEX=${pool};GTEST_BRIEF=1;${ARG_ENVIRONMENT}")
        endforeach()
        return()
    endif()
    set(filter)
    if(ARG_FILTER)
        set(filter TEST_FILTER "${ARG_FILTER}")
    endif()
    gtest_discover_tests(${name} ${filter} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 120 PROPERTIES ${properties})
endfunction()

function(clipfile_check_tests_registered)
    set(roots libs modules host clipfile bench fuzz)
    list(TRANSFORM roots PREPEND "${PROJECT_SOURCE_DIR}/")
    list(TRANSFORM roots APPEND "/*_test.cc" OUTPUT_VARIABLE patterns)
    file(GLOB_RECURSE found CONFIGURE_DEPENDS ${patterns})
    get_property(registered GLOBAL PROPERTY CLIPFILE_REGISTERED_TESTS)
    if(registered)
        list(REMOVE_ITEM found ${registered})
    endif()
    if(found)
        list(JOIN found "\n  " lines)
        message(FATAL_ERROR "These tests are not registered with clipfile_add_test:\n  ${lines}")
    endif()
endfunction()
