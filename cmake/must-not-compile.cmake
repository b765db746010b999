# Checks that SOURCE does not compile if DEFINITION is defined, and that the compiler's error matches MESSAGE. ctest runs
# this script for mount_point_must_not_compile (see Testing.cmake).

set(ENV{LC_ALL} C)
execute_process(COMMAND ${COMMAND_LINE} -D${DEFINITION} "${SOURCE}"
  RESULT_VARIABLE result ERROR_VARIABLE errors OUTPUT_QUIET)
if(result EQUAL 0)
  message(FATAL_ERROR "${SOURCE} compiles with ${DEFINITION}, but must not.")
endif()
if(NOT errors MATCHES "${MESSAGE}")
  message(FATAL_ERROR "With ${DEFINITION}, the compiler's error does not match \"${MESSAGE}\":\n${errors}")
endif()
