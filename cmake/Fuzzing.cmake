# Fuzzers: libFuzzer programs in fuzz/, built where the address sanitizer is (the preset `address`).

include_guard(GLOBAL)

# mount_point_fuzzer(NAME SOURCES FILE… [LIBRARIES TARGET…] [RUNS COUNT] [DEFINITIONS DEFINITION…])
#
# Adds the fuzzer NAME, and the ctest entry NAME.short-run, which runs it COUNT times (20000 unless given;
# choose a few seconds' worth) over what grows from the files in corpus/NAME, always the same way. The
# corpus itself is only read. The libraries are instrumented, so that the fuzzer sees their branches.
#
# To look for longer, and keep what is found in a folder of one's own:
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
