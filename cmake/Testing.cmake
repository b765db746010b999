# Defines how the test programs are built and become entries of ctest. They use GoogleTest and stand beside the code
# that they test.

include_guard(GLOBAL)
find_package(GTest REQUIRED)
include(GoogleTest)

# Two things make tests slow to compile: GoogleTest's headers, which are therefore precompiled once for all tests, and
# the many temporaries. So tests get few debug symbols, except in the preset `development`, and are optimised little.
# With clang and in instrumented builds, they are not optimised at all. This does not change the options of the
# libraries.
add_library(test-options INTERFACE)
if(MOUNT_POINT_INSTRUMENTATION OR CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  target_compile_options(test-options INTERFACE -g1 -O0)
else()
  target_compile_options(test-options INTERFACE "$<$<NOT:$<CONFIG:Debug>>:-g1;-O1>")
endif()
target_link_libraries(test-options INTERFACE MountPoint::Options GTest::gmock GTest::gtest_main)
if(MOUNT_POINT_INSTRUMENTATION STREQUAL "coverage")
  add_library(coverage-at-end OBJECT "${PROJECT_SOURCE_DIR}/tests/support/CoverageAtEnd.cpp")
  target_link_libraries(coverage-at-end PRIVATE MountPoint::Options)
  target_sources(test-options INTERFACE $<TARGET_OBJECTS:coverage-at-end>)
endif()
# The owner of the precompiled headers must be compiled with the same options as the tests.
add_executable(test-headers "${PROJECT_SOURCE_DIR}/cmake/test-headers.cpp")
target_precompile_headers(test-headers PRIVATE <gtest/gtest.h> <gmock/gmock.h>)
target_link_libraries(test-headers PRIVATE test-options)

# mount_point_test(NAME SOURCES FILE… [LIBRARIES TARGET…] [DEFINITIONS DEFINITION…])
#
# Adds the test program NAME. It uses GoogleTest's `main`, unless one of its sources defines `main`.
function(mount_point_test name)
  cmake_parse_arguments(PARSE_ARGV 1 test "" "" "SOURCES;LIBRARIES;DEFINITIONS")
  add_executable(${name} ${test_SOURCES})
  target_link_libraries(${name} PRIVATE test-options ${test_LIBRARIES})
  target_precompile_headers(${name} REUSE_FROM test-headers)
  target_compile_definitions(${name} PRIVATE ${test_DEFINITIONS})
  if(NOT MOUNT_POINT_UNIT_TESTS)
    set_target_properties(${name} PROPERTIES EXCLUDE_FROM_ALL ON)
  endif()
  mount_point_test_entries(${name} ${name})
endfunction()

# mount_point_test_entries(NAME ENTRY [ARGUMENT…])
#
# Adds the cases of the test program NAME to ctest. Each is an entry ENTRY.SUITE.CASE and runs in its own process, with
# the given arguments. In an instrumented build, starting a process takes longer than running a case. So there, a
# single entry ENTRY runs all cases in one process.
function(mount_point_test_entries name entry)
  if(NOT MOUNT_POINT_UNIT_TESTS OR (CMAKE_CROSSCOMPILING AND NOT CMAKE_CROSSCOMPILING_EMULATOR))
    return()
  endif()
  if(MOUNT_POINT_INSTRUMENTATION)
    add_test(NAME ${entry} COMMAND ${name} ${ARGN})
  else()
    gtest_discover_tests(${name} TEST_PREFIX "${entry}." DISCOVERY_TIMEOUT 60 EXTRA_ARGS ${ARGN})
  endif()
endfunction()

# mount_point_must_not_compile(TEST SOURCE FILE [COMPILER ID] MISTAKES MACRO REGEX…)
#
# FILE contains valid code and, between `#ifdef MACRO` and `#endif`, mistakes. Adds these entries to ctest:
#
#   must-compile.FILE                 checks that FILE compiles if no MACRO is defined
#   TEST.must-not-compile.MACRO       checks that FILE does not compile if MACRO is defined, and that the compiler's
#                                     error matches REGEX; there is one such entry for each MACRO
#
# Nothing is linked. Includes are relative to the repository's root. With COMPILER (GNU or Clang), no other compiler
# has these entries. Instrumented builds leave them out, because the compiler would only report the same again.
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
