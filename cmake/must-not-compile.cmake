# Run by ctest for mount_point_must_not_compile (see Testing.cmake): with DEFINITION the source must not
# compile, and the compiler must say what MESSAGE matches.

set(ENV{LC_ALL} C)
execute_process(COMMAND ${COMMAND_LINE} -D${DEFINITION} "${SOURCE}"
  RESULT_VARIABLE result ERROR_VARIABLE errors OUTPUT_QUIET)
if(result EQUAL 0)
  message(FATAL_ERROR "${SOURCE} compiles with ${DEFINITION}.")
endif()
if(NOT errors MATCHES "${MESSAGE}")
  message(FATAL_ERROR "With ${DEFINITION} the compiler does not say \"${MESSAGE}\" but:\n${errors}")
endif()
