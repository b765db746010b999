# Tests a program that forks and uses a shared library. Both contain the runtime. Their exported symbols, and the way in
# which the library is loaded, decide whether they share one runtime or have two.

# loading_forks(NAME EXPECTED HOW VISIBILITY [EXPORTS]) adds an entry to ctest.
#
#   EXPECTED       "shared" or "separate": whether both use the same runtime
#   HOW            "linked" or "opened": how the program loads the library
#   VISIBILITY     "exported" or "hidden": the visibility of the runtime's symbols in the library
#   EXPORTS        makes the program export its symbols
function(loading_forks name expected how visibility)
  set(program "loading-forks-${name}")
  add_library(${program}-library SHARED fork-library.cpp)
  add_executable(${program} fork-program.cpp)
  foreach(target ${program} ${program}-library)
    target_link_libraries(${target} PRIVATE MountPoint::Options MountPoint::Runtime)
  endforeach()
  if(visibility STREQUAL "hidden")
    target_link_options(${program}-library PRIVATE -Wl,--exclude-libs,ALL)
    target_compile_options(${program}-library PRIVATE -fvisibility=hidden -fvisibility-inlines-hidden)
  endif()
  if("EXPORTS" IN_LIST ARGN)
    set_target_properties(${program} PROPERTIES ENABLE_EXPORTS ON)
  endif()
  if(how STREQUAL "linked")
    target_link_libraries(${program} PRIVATE -Wl,--no-as-needed ${program}-library)
  else()
    add_dependencies(${program} ${program}-library)
  endif()
  add_test(NAME loading.forks.${name} COMMAND ${program} "$<TARGET_FILE:${program}-library>" ${expected})
endfunction()

loading_forks(linked shared linked exported)
loading_forks(linked-exports shared linked exported EXPORTS)
loading_forks(linked-hidden separate linked hidden)
loading_forks(linked-hidden-exports separate linked hidden EXPORTS)
loading_forks(opened separate opened exported)
loading_forks(opened-exports shared opened exported EXPORTS)
loading_forks(opened-hidden separate opened hidden)

# Tests a program without the runtime. It opens and closes a library that uses only a lock of the runtime.
add_library(loading-lock-library MODULE lock-library.cpp)
target_include_directories(loading-lock-library PRIVATE "${PROJECT_SOURCE_DIR}")
# This links only those objects of the archive that the library refers to.
target_link_libraries(loading-lock-library PRIVATE MountPoint::Options "$<TARGET_FILE:runtime>")
add_dependencies(loading-lock-library runtime)
target_compile_options(loading-lock-library PRIVATE -fvisibility=hidden -fvisibility-inlines-hidden)
target_link_options(loading-lock-library PRIVATE -Wl,--exclude-libs,ALL)
add_executable(loading-lock-host lock-host.cpp)
target_link_libraries(loading-lock-host PRIVATE MountPoint::Options ${CMAKE_DL_LIBS})
add_dependencies(loading-lock-host loading-lock-library)
add_test(NAME loading.closed.lock COMMAND loading-lock-host "$<TARGET_FILE:loading-lock-library>")
