# Copies every example out of the source tree, builds it against the installed libraries only, and checks its output.
# ctest runs this script and sets BUILD, COMPILER, FLAGS, PYTHON and WORK.

include("${CMAKE_CURRENT_LIST_DIR}/run.cmake")

file(REMOVE_RECURSE "${WORK}")
run("${CMAKE_COMMAND}" --install "${BUILD}" --component development --prefix "${WORK}/installed")

cmake_path(SET tests NORMALIZE "${CMAKE_CURRENT_LIST_DIR}/..")
file(GLOB projects "${tests}/../examples/*/CMakeLists.txt")
if(NOT projects)
  message(FATAL_ERROR "There are no examples.")
endif()
foreach(project ${projects})
  cmake_path(GET project PARENT_PATH folder)
  cmake_path(GET folder FILENAME example)
  file(COPY "${folder}" DESTINATION "${WORK}/copied")
  run("${CMAKE_COMMAND}" -S "${WORK}/copied/${example}" -B "${WORK}/build/${example}"
    "-DCMAKE_CXX_COMPILER=${COMPILER}" "-DCMAKE_CXX_FLAGS=${FLAGS}" "-DCMAKE_PREFIX_PATH=${WORK}/installed")
  run("${CMAKE_COMMAND}" --build "${WORK}/build/${example}")
  run("${PYTHON}" "${tests}/check-output" "${WORK}/copied/${example}/output.txt" "${WORK}/build/${example}")
endforeach()
