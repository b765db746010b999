# Run by ctest for mount_point_must_not_compile (see Testing.cmake): the source must compile as it is and
# must not with DEFINITION, in which case the compiler must say what MESSAGE matches.

set(ENV{LC_ALL} C)
execute_process(COMMAND ${COMMAND_LINE} "${SOURCE}" RESULT_VARIABLE result ERROR_VARIABLE errors OUTPUT_QUIET)
if(NOT result EQUAL 0)
  message(FATAL_ERROR "${SOURCE} does not even compile without ${DEFINITION}:\n${errors}")
endif()

execute_process(COMMAND ${COMMAND_LINE} -D${DEFINITION} "${SOURCE}"
  RESULT_VARIABLE result ERROR_VARIABLE errors OUTPUT_QUIET)
if(result EQUAL 0)
  message(FATAL_ERROR "${SOURCE} compiles with ${DEFINITION}.")
endif()
if(NOT errors MATCHES "${MESSAGE}")
  message(FATAL_ERROR "With ${DEFINITION} the compiler does not say \"${MESSAGE}\" but:\n${errors}")
endif()
