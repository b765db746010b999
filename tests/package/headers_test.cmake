# Run by ctest, with BUILD, COMPILER, PYTHON, ROOT and WORK: installs what was built, and checks its headers.

include("${CMAKE_CURRENT_LIST_DIR}/run.cmake")

file(REMOVE_RECURSE "${WORK}")
run("${CMAKE_COMMAND}" --install "${BUILD}" --component development --prefix "${WORK}/installed")
run("${PYTHON}" "${CMAKE_CURRENT_LIST_DIR}/../check-headers" "${ROOT}" "${WORK}/installed/include/mount-point" "${COMPILER}")
