# Tests: GoogleTest programs beside what they test, as entries of ctest.

include_guard(GLOBAL)
find_package(GTest REQUIRED)
include(GoogleTest)

# What a test takes to compile is mostly GoogleTest's headers, which are compiled once for all, and what becomes of
# its many temporaries: but in the build for the debugger, tests get few symbols, and they are optimised, like what
# is shipped, by g++ alone. The libraries are compiled as ever.
add_library(test-options INTERFACE)
if(MOUNT_POINT_INSTRUMENTATION OR CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  target_compile_options(test-options INTERFACE -g1 -O0)
else()
  target_compile_options(test-options INTERFACE $<$<NOT:$<CONFIG:Debug>>:-g1>)
endif()
target_link_libraries(test-options INTERFACE MountPoint::Options GTest::gmock GTest::gtest_main)
if(MOUNT_POINT_INSTRUMENTATION STREQUAL "coverage")
  add_library(coverage-at-end OBJECT "${PROJECT_SOURCE_DIR}/tests/support/CoverageAtEnd.cpp")
  target_link_libraries(coverage-at-end PRIVATE MountPoint::Options)
  target_sources(test-options INTERFACE $<TARGET_OBJECTS:coverage-at-end>)
endif()
# A program like the tests, since it must be compiled as they are.
add_executable(test-headers "${PROJECT_SOURCE_DIR}/cmake/test-headers.cpp")
target_precompile_headers(test-headers PRIVATE <gtest/gtest.h> <gmock/gmock.h>)
target_link_libraries(test-headers PRIVATE test-options)

# mount_point_test(NAME SOURCES FILE… [LIBRARIES TARGET…] [DEFINITIONS DEFINITION…])
#
# Adds the test program NAME with GoogleTest's own main (name another one by not linking it: a source
# that defines main wins).
function(mount_point_test name)
  cmake_parse_arguments(PARSE_ARGV 1 test "" "" "SOURCES;LIBRARIES;DEFINITIONS")
  add_executable(${name} ${test_SOURCES})
  target_link_libraries(${name} PRIVATE test-options ${test_LIBRARIES})
  target_precompile_headers(${name} REUSE_FROM test-headers)
  target_compile_definitions(${name} PRIVATE ${test_DEFINITIONS})
  mount_point_test_entries(${name} ${name})
endfunction()

# mount_point_test_entries(NAME ENTRY [ARGUMENT…])
#
# Adds the cases of the test program NAME, run with these arguments, to ctest as ENTRY.SUITE.CASE, each in a
# process of its own; in an instrumented build, which takes longer to start than a case to run, all in one, as ENTRY.
function(mount_point_test_entries name entry)
  if(MOUNT_POINT_INSTRUMENTATION)
    add_test(NAME ${entry} COMMAND ${name} ${ARGN})
  else()
    gtest_discover_tests(${name} TEST_PREFIX "${entry}." DISCOVERY_TIMEOUT 60 EXTRA_ARGS ${ARGN})
  endif()
endfunction()

# mount_point_must_not_compile(TEST SOURCE FILE [COMPILER ID] MISTAKES MACRO REGEX…)
#
# FILE holds what is right and, between `#ifdef MACRO` and `#endif`, mistakes. Adds for each MACRO the ctest entry
# TEST.must-not-compile.MACRO: with MACRO defined FILE does not compile, and the compiler's complaint matches
# REGEX; and the entry must-compile.FILE: it compiles as it is. Nothing is linked; includes are from the
# repository's root. With COMPILER (GNU or Clang) all are left out under any other; so are they in an instrumented
# build, where the compiler would say the same once more.
function(mount_point_must_not_compile test)
  cmake_parse_arguments(PARSE_ARGV 1 given "" "SOURCE;COMPILER" "MISTAKES")
  if(MOUNT_POINT_INSTRUMENTATION OR (given_COMPILER AND NOT CMAKE_CXX_COMPILER_ID STREQUAL given_COMPILER))
    return()
  endif()
  set(command "${CMAKE_CXX_COMPILER}" -std=c++20 -fsyntax-only -Wall -Wextra -Werror -fno-caret-diagnostics
    "-I${PROJECT_SOURCE_DIR}")
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    list(REMOVE_ITEM command -fno-caret-diagnostics)
    list(APPEND command -fno-diagnostics-show-caret)
  else()
    list(APPEND command -Wthread-safety -Wthread-safety-beta)
  endif()
  cmake_path(ABSOLUTE_PATH given_SOURCE OUTPUT_VARIABLE file)
  cmake_path(RELATIVE_PATH file BASE_DIRECTORY "${PROJECT_SOURCE_DIR}" OUTPUT_VARIABLE source)
  add_test(NAME "must-compile.${source}" COMMAND ${command} "${file}")
  while(given_MISTAKES)
    list(POP_FRONT given_MISTAKES macro regex)
    add_test(NAME "${test}.must-not-compile.${macro}" COMMAND "${CMAKE_COMMAND}"
      "-DCOMMAND_LINE=${command}" "-DSOURCE=${file}" "-DDEFINITION=${macro}" "-DMESSAGE=${regex}"
      -P "${PROJECT_SOURCE_DIR}/cmake/must-not-compile.cmake")
  endwhile()
endfunction()
