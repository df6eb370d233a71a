# SPDX-License-Identifier: MIT
#
# GoogleTest for every suite: the installed library when it fits the target, else its sources
# (32-bit and foreign targets).
find_package(GTest CONFIG QUIET)
if(NOT TARGET GTest::gtest_main AND NOT EXISTS /usr/src/googletest/CMakeLists.txt)
    switch_off("needs package libgtest-dev" unit_tests rehearse_tests rehearse_truth sandbox_tests oracle_tests sfdisk_test
        mdrequests_test fault_tests kill_tests coverage growth)
elseif(NOT TARGET GTest::gtest_main)
    set(INSTALL_GTEST OFF CACHE BOOL "" FORCE)
    set(BUILD_GMOCK OFF CACHE BOOL "" FORCE)
    add_subdirectory(/usr/src/googletest "${CMAKE_BINARY_DIR}/googletest" EXCLUDE_FROM_ALL)
    if(NOT TARGET GTest::gtest_main)
        add_library(GTest::gtest_main ALIAS gtest_main)
    endif()
endif()

# What nearly every test includes, parsed once for a test program: half of what compiling them takes.
set(TEST_HEADERS <gtest/gtest.h> <functional> <map> <string> <vector>)
# UBSan is for the code under test: in that of tests it takes as long to compile as all the rest. And test
# programs of many files are compiled far more often than run.
set(HARNESS_OPTIONS -fno-sanitize=undefined)
set(TEST_OPTIONS ${HARNESS_OPTIONS} -O0)
