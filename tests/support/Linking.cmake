# Compiles and links the parts of test programs in many ways. The tests show that load hooks, classes and class methods
# are found however a program is linked.

include_guard(GLOBAL)
include(CheckLinkerFlag)

# linked_part(NAME SOURCE OPTION…) compiles SOURCE with the options and adds the object library NAME.
function(linked_part name source)
  add_library(${name} OBJECT ${source})
  target_include_directories(${name} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_compile_options(${name} PRIVATE ${ARGN})
  target_link_libraries(${name} PRIVATE MountPoint::Options)
endfunction()

# uses_program(LIBRARY) lets the library use symbols of the program that loads it. Linkers for Linux always allow that.
function(uses_program library)
  if(CMAKE_SYSTEM_NAME STREQUAL "Darwin")
    target_link_options(${library} PRIVATE -undefined dynamic_lookup)
  endif()
endfunction()

# linked_variants(PREFIX) calls two functions of the caller:
#
#   PREFIX_parts(SET OPTION…)          once for each way to compile the parts; OPTION… are compiler options
#   PREFIX_ways(SET NAME OPTION…)      once for each way NAME to link the parts of SET; OPTION… are linker options
#
# Do not link MountPoint::Options, because not every linker knows all of those options.
function(linked_variants prefix)
  function(parts)
    cmake_language(CALL ${prefix}_parts ${ARGN})
  endfunction()
  function(ways set name)
    set(options ${instrumentation} ${ARGN})
    if(CMAKE_SYSTEM_NAME STREQUAL "Linux")
      # A library must be linked even if no symbol refers to it.
      list(APPEND options -Wl,--no-as-needed)
    endif()
    cmake_language(CALL ${prefix}_ways ${set} ${name} ${options})
  endfunction()

  parts(sections -ffunction-sections -fdata-sections)
  ways(sections plain)
  if(MOUNT_POINT_INSTRUMENTATION)
    return()
  endif()

  if(CMAKE_SYSTEM_NAME STREQUAL "Linux")
    # Each linker discards different sections.
    foreach(linker bfd gold lld)
      check_linker_flag(CXX -fuse-ld=${linker} MOUNT_POINT_HAS_${linker})
      if(MOUNT_POINT_HAS_${linker})
        ways(sections gc-sections-${linker} -fuse-ld=${linker} -Wl,--gc-sections)
      endif()
    endforeach()
  endif()

  parts(hidden -fvisibility=hidden -fvisibility-inlines-hidden)
  ways(hidden hidden)

  # clang's link-time optimisation needs lld. The objects are "fat" because the archiver may be older than the compiler.
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    parts(lto -flto)
    ways(lto lto -flto)
  elseif(MOUNT_POINT_HAS_lld)
    parts(lto -flto -ffat-lto-objects)
    ways(lto lto -flto -ffat-lto-objects -fuse-ld=lld)
  endif()
endfunction()
