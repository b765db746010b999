# Tests: GoogleTest programs beside what they test, each test case an entry of ctest.

include_guard(GLOBAL)
find_package(GTest REQUIRED)
include(GoogleTest)

# mount_point_test(NAME SOURCES FILE… [LIBRARIES TARGET…] [DEFINITIONS DEFINITION…])
#
# Adds the test program NAME with GoogleTest's own main (name another one by not linking it: a source
# that defines main wins). Every case in it becomes the ctest entry NAME.SUITE.CASE.
function(mount_point_test name)
  cmake_parse_arguments(PARSE_ARGV 1 test "" "" "SOURCES;LIBRARIES;DEFINITIONS")
  add_executable(${name} ${test_SOURCES})
  target_link_libraries(${name} PRIVATE MountPoint::Options ${test_LIBRARIES} GTest::gmock GTest::gtest_main)
  target_compile_definitions(${name} PRIVATE ${test_DEFINITIONS})
  gtest_discover_tests(${name} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 60)
endfunction()
