# Run by ctest, with BUILD, COMPILER, FLAGS, WORK, WAY (find_package or pkg-config) and PKG_CONFIG: installs
# what was built and builds the programs beside this file with nothing else, as a stranger would. Each is called as
# pkg-config calls the library that it uses, less "mount-point-", and prints 42.

include("${CMAKE_CURRENT_LIST_DIR}/run.cmake")

file(REMOVE_RECURSE "${WORK}")
run("${CMAKE_COMMAND}" --install "${BUILD}" --component development --prefix "${WORK}/first")
# What is installed may be moved.
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
    message(FATAL_ERROR "The program of ${library} printed \"${output}\".")
  endif()
endforeach()
