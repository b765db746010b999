# Programs of parts that are linked in many ways, to see that what is announced when a program is loaded is
# announced in each of them.

include_guard(GLOBAL)
include(CheckLinkerFlag)

# linked_part(NAME SOURCE OPTION…): compiles SOURCE with the options, to the object library NAME.
function(linked_part name source)
  add_library(${name} OBJECT ${source})
  target_include_directories(${name} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_compile_options(${name} PRIVATE ${ARGN})
  target_link_libraries(${name} PRIVATE MountPoint::Options)
endfunction()

# linked_variants(PREFIX): calls PREFIX_parts(SET OPTION…) for each way of compiling the parts, and for each way of
# linking those of SET PREFIX_ways(SET NAME OPTION…), where NAME tells the way. The options are those of the linker,
# for all that is linked; MountPoint::Options are not to be linked, since not every linker knows all of them.
function(linked_variants prefix)
  function(parts)
    cmake_language(CALL ${prefix}_parts ${ARGN})
  endfunction()
  function(ways set name)
    set(options ${instrumentation} ${ARGN})
    if(CMAKE_SYSTEM_NAME STREQUAL "Linux")
      # Nothing need refer to a library for it to matter.
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
    # The linkers differ in what they discard.
    foreach(linker bfd gold lld)
      check_linker_flag(CXX -fuse-ld=${linker} MOUNT_POINT_HAS_${linker})
      if(MOUNT_POINT_HAS_${linker})
        ways(sections gc-sections-${linker} -fuse-ld=${linker} -Wl,--gc-sections)
      endif()
    endforeach()
  endif()

  parts(hidden -fvisibility=hidden -fvisibility-inlines-hidden)
  ways(hidden hidden)

  # Clang's link-time optimisation needs its own linker, and the archiver may be older than the compiler.
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
    parts(lto -flto)
    ways(lto lto -flto)
  elseif(MOUNT_POINT_HAS_lld)
    parts(lto -flto -ffat-lto-objects)
    ways(lto lto -flto -ffat-lto-objects -fuse-ld=lld)
  endif()
endfunction()
