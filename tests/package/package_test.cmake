# Installs the libraries and builds the programs beside this file against the installed tree only. Each program is named
# after its library: the library's pkg-config name without "mount-point-". Each program prints 42.
#
# ctest runs this script and sets BUILD, COMPILER, FLAGS, WORK, WAY (find_package or pkg-config) and PKG_CONFIG.

include("${CMAKE_CURRENT_LIST_DIR}/run.cmake")

file(REMOVE_RECURSE "${WORK}")
run("${CMAKE_COMMAND}" --install "${BUILD}" --component development --prefix "${WORK}/first")
# The installed tree must still work after it has been moved.
file(RENAME "${WORK}/first" "${WORK}/installed")

set(libraries runtime logging error-handler older-logger logging-shim provider service-registry)
separate_arguments(flags UNIX_COMMAND "${FLAGS}")
if(WAY STREQUAL "find_package")
  run("${CMAKE_COMMAND}" -S "${CMAKE_CURRENT_LIST_DIR}" -B "${WORK}/build" "-DCMAKE_CXX_COMPILER=${COMPILER}"
    "-DCMAKE_CXX_FLAGS=${FLAGS}" "-DCMAKE_PREFIX_PATH=${WORK}/installed")
  run("${CMAKE_COMMAND}" --build "${WORK}/build")
else()
  file(GLOB_RECURSE description "${WORK}/installed/*/mount-point-runtime.pc")
  cmake_path(GET description PARENT_PATH folder)
  set(ENV{PKG_CONFIG_PATH} "${folder}")
  file(MAKE_DIRECTORY "${WORK}/build")
  foreach(library ${libraries})
    run("${PKG_CONFIG}" --cflags --libs mount-point-${library})
    string(STRIP "${output}" output)
    separate_arguments(package UNIX_COMMAND "${output}")
    run("${COMPILER}" -std=c++20 ${flags} "${CMAKE_CURRENT_LIST_DIR}/${library}.cpp" ${package}
      -o "${WORK}/build/${library}")
  endforeach()
endif()

foreach(library ${libraries})
  run("${WORK}/build/${library}")
  if(NOT output STREQUAL "42\n")
    message(FATAL_ERROR "The program ${library} printed \"${output}\" and not \"42\".")
  endif()
endforeach()
