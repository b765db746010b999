# Defines how the fuzzers in fuzz/ are built and run. They use libFuzzer and are part of the preset `address`.

include_guard(GLOBAL)

# mount_point_fuzzer(NAME SOURCES FILE… [LIBRARIES TARGET…] [RUNS COUNT] [DEFINITIONS DEFINITION…])
#
# Adds the fuzzer NAME and the ctest entry NAME.short-run. The entry runs COUNT inputs, by default 20000; choose COUNT
# so that a run takes a few seconds. The inputs are mutations of the files in corpus/NAME. The seed is fixed, so
# every run is the same. The corpus is only read. The libraries are instrumented, so the fuzzer sees their branches.
#
# To run a fuzzer for longer and keep the inputs that it finds in FOLDER:
#
#     build/address/fuzz/NAME -max_total_time=300 FOLDER fuzz/corpus/NAME
function(mount_point_fuzzer name)
  cmake_parse_arguments(PARSE_ARGV 1 fuzzer "" "RUNS" "SOURCES;LIBRARIES;DEFINITIONS")
  if(NOT fuzzer_RUNS)
    set(fuzzer_RUNS 20000)
  endif()
  add_executable(${name} ${fuzzer_SOURCES})
  target_link_libraries(${name} PRIVATE MountPoint::Options ${fuzzer_LIBRARIES})
  target_compile_definitions(${name} PRIVATE ${fuzzer_DEFINITIONS})
  target_compile_options(${name} PRIVATE -fsanitize=fuzzer)
  target_link_options(${name} PRIVATE -fsanitize=fuzzer)

  file(GLOB seeds CONFIGURE_DEPENDS "${CMAKE_CURRENT_SOURCE_DIR}/corpus/${name}/*")
  list(JOIN seeds "," seeds)
  file(CONFIGURE OUTPUT "${CMAKE_CURRENT_BINARY_DIR}/${name}.seeds" CONTENT "${seeds}")
  add_test(NAME ${name}.short-run COMMAND ${name} -runs=${fuzzer_RUNS} -seed=1 -timeout=20
    "-seed_inputs=@${CMAKE_CURRENT_BINARY_DIR}/${name}.seeds" "-artifact_prefix=${CMAKE_CURRENT_BINARY_DIR}/${name}.")
  set_tests_properties(${name}.short-run PROPERTIES FAIL_REGULAR_EXPRESSION "starting from an empty corpus")
endfunction()
