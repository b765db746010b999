# Installs the libraries, and builds and runs programs against the installed tree only.
#
# ctest runs this script and sets BUILD, COMPILER, FLAGS, WORK, WAY (find_package or pkg-config) and PKG_CONFIG.

include("${CMAKE_CURRENT_LIST_DIR}/hosts.cmake")

file(REMOVE_RECURSE "${WORK}")
run("${CMAKE_COMMAND}" --install "${BUILD}" --component development --prefix "${WORK}/first")
# The installed tree must still work after it has been moved.
file(RENAME "${WORK}/first" "${WORK}/installed")

if(WAY STREQUAL "find_package")
  build_hosts(find_package "-DCMAKE_CXX_COMPILER=${COMPILER}" "-DCMAKE_CXX_FLAGS=${FLAGS}")
else()
  separate_arguments(flags UNIX_COMMAND "${FLAGS}")
  build_hosts(pkg-config "${COMPILER}" ${flags})
endif()
run_hosts()
