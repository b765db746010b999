# Checks the files that were built for macOS, and the package. None of these tests needs macOS. Include this file after all
# folders with programs.

find_package(Python3 REQUIRED COMPONENTS Interpreter)
set(folder "${CMAKE_CURRENT_LIST_DIR}")
set(stubs "${PROJECT_SOURCE_DIR}/build/macos-stubs")
# Tests that name the target of the interpreter would run it like a program for macOS.
set(check_mach_o "${Python3_EXECUTABLE}" "${folder}/check-mach-o"
  --stubs "${stubs}/${MACOS_PROCESSOR}.tbd" --minimum "${CMAKE_OSX_DEPLOYMENT_TARGET}")

# Like that of Linux, the command carries the libraries, and few functions run before `main`: one announces all classes, and
# the others belong to profiling and to the C++ library.
add_test(NAME macos.files.command COMMAND ${check_mach_o}
  --alone --hidden --imports ___stack_chk_fail --stripped --signed --initialisers 4 --size 1200000
  --map "$<TARGET_FILE:mount-point>.map"
  --first rt6detail13announceImage
  --contains SRLRegistry4load --contains LUMLogMultiplexer14logWithMessage --contains PECErrorHandler9register_
  --contains ZEBLogger12sharedLogger --contains LUMLoggingReroutingZEBLogger --contains AVOProvider3get
  "$<TARGET_FILE:mount-point>")

# Sets `variable` to the linked files of the folder and of those below it, except for this one.
function(find_linked_files variable directory)
  set(files "")
  get_property(targets DIRECTORY "${directory}" PROPERTY BUILDSYSTEM_TARGETS)
  foreach(target ${targets})
    get_target_property(type ${target} TYPE)
    get_target_property(is_left_out ${target} EXCLUDE_FROM_ALL)
    if(type MATCHES "^(EXECUTABLE|SHARED_LIBRARY|MODULE_LIBRARY)$" AND NOT is_left_out)
      list(APPEND files "$<TARGET_FILE:${target}>")
    endif()
  endforeach()
  get_property(subdirectories DIRECTORY "${directory}" PROPERTY SUBDIRECTORIES)
  list(REMOVE_ITEM subdirectories "${CMAKE_CURRENT_FUNCTION_LIST_DIR}")
  foreach(subdirectory ${subdirectories})
    find_linked_files(below "${subdirectory}")
    list(APPEND files ${below})
  endforeach()
  set(${variable} "${files}" PARENT_SCOPE)
endfunction()

find_linked_files(files "${PROJECT_SOURCE_DIR}")
add_test(NAME macos.files.all COMMAND ${check_mach_o} ${files})

# Checks the check itself.
add_test(NAME macos.files.broken COMMAND "${Python3_EXECUTABLE}" "${folder}/check-mach-o-test"
  "${stubs}/x86_64.tbd" "${stubs}/arm64.tbd" "${PROJECT_SOURCE_DIR}/cmake/macos/x86_64-apple-macos-clang++")

# Checks the package: a host that has nothing else builds against it, and runs if something here can run it.
find_program(PKG_CONFIG NAMES pkgconf pkg-config)
mark_as_advanced(PKG_CONFIG)
add_test(NAME macos.package COMMAND "${CMAKE_COMMAND}" "-DBUILD=${PROJECT_BINARY_DIR}" "-DROOT=${PROJECT_SOURCE_DIR}"
  "-DCOMPILER=${CMAKE_CXX_COMPILER}" "-DPROCESSOR=${MACOS_PROCESSOR}" "-DLAUNCHER=${CMAKE_CROSSCOMPILING_EMULATOR}"
  "-DCHECK=${check_mach_o}" "-DPKG_CONFIG=${PKG_CONFIG}"
  "-DWORK=${CMAKE_CURRENT_BINARY_DIR}/package" -P "${folder}/package_test.cmake")
set_tests_properties(macos.package PROPERTIES COST 1000)  # It takes longest, so it begins first.
