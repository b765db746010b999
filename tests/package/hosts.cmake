# Builds and runs the programs beside this file, in the folder WORK and against WORK/installed only. Each program is named
# after its library: the library's pkg-config name without "mount-point-". Each program prints 42.

include("${CMAKE_CURRENT_LIST_DIR}/run.cmake")
set(libraries runtime logging error-handler older-logger logging-shim provider service-registry)

# build_hosts(WAY [OPTION…])
#
# Finds the libraries by WAY: find_package, with options of CMake, or pkg-config, with a compiler and its options.
function(build_hosts way)
  set(sources "${CMAKE_CURRENT_FUNCTION_LIST_DIR}")
  file(REMOVE_RECURSE "${WORK}/build")
  if(way STREQUAL "find_package")
    run("${CMAKE_COMMAND}" -S "${sources}" -B "${WORK}/build" ${ARGN} "-DCMAKE_PREFIX_PATH=${WORK}/installed")
    run("${CMAKE_COMMAND}" --build "${WORK}/build")
    return()
  endif()
  file(GLOB_RECURSE description "${WORK}/installed/*/mount-point-runtime.pc")
  cmake_path(GET description PARENT_PATH folder)
  set(ENV{PKG_CONFIG_LIBDIR} "${folder}")
  file(MAKE_DIRECTORY "${WORK}/build")
  foreach(library ${libraries})
    run("${PKG_CONFIG}" --cflags --libs mount-point-${library})
    string(STRIP "${output}" output)
    separate_arguments(package UNIX_COMMAND "${output}")
    run(${ARGN} -std=c++20 "${sources}/${library}.cpp" ${package} -o "${WORK}/build/${library}")
  endforeach()
endfunction()

# run_hosts([LAUNCHER…])
#
# Runs each program, as an argument of LAUNCHER if there is one.
function(run_hosts)
  foreach(library ${libraries})
    run(${ARGN} "${WORK}/build/${library}")
    if(NOT output STREQUAL "42\n")
      message(FATAL_ERROR "The program ${library} printed \"${output}\" and not \"42\".")
    endif()
  endforeach()
endfunction()
