# Defines the compiler options of the whole project: the language, the warnings, the hardening and the
# instrumentation (a sanitizer or coverage). Link `MountPoint::Options` privately. It is never installed.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)

add_library(compiler-options INTERFACE)
add_library(MountPoint::Options ALIAS compiler-options)

target_compile_options(compiler-options INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wsign-conversion -Wold-style-cast
  -Wnon-virtual-dtor -Woverloaded-virtual -Wcast-align -Wformat=2 -Wundef -Wunused
  $<$<CXX_COMPILER_ID:GNU>:-Wduplicated-cond -Wlogical-op -Wuseless-cast>
  $<$<CXX_COMPILER_ID:Clang,AppleClang>:-Wthread-safety -Wthread-safety-beta>
  $<$<BOOL:${MOUNT_POINT_WARNINGS_AS_ERRORS}>:-Werror>)

# No host interposes functions of the libraries, so g++ may call them directly and inline them. clang always
# assumes this.
target_compile_options(compiler-options INTERFACE
  $<$<CXX_COMPILER_ID:GNU>:-fno-semantic-interposition>)

# What is built for another machine does not name the folders of this one, so equal sources make equal packages. The C++
# library writes the names of its headers into the debugging information.
if(CMAKE_CROSSCOMPILING)
  target_compile_options(compiler-options INTERFACE
    "-fdebug-prefix-map=${PROJECT_SOURCE_DIR}=." "-fmacro-prefix-map=${PROJECT_SOURCE_DIR}/cmake=./cmake")
endif()

# These options put each function and variable into its own section. A program's linker can then drop unused ones
# (`--gc-sections`).
target_compile_options(compiler-options INTERFACE -ffunction-sections -fdata-sections)

# Every build has the hardening that costs next to nothing. Fortification needs the optimiser, so only optimised builds
# have it. Instrumented builds do not, because it would hide the sanitizers' own checks.
target_compile_options(compiler-options INTERFACE
  -fstack-protector-strong
  $<$<PLATFORM_ID:Linux>:-fstack-clash-protection>
  $<$<PLATFORM_ID:Linux>:-fcf-protection=full>)
target_compile_definitions(compiler-options INTERFACE
  $<$<PLATFORM_ID:Linux>:_GLIBCXX_ASSERTIONS>
  $<$<PLATFORM_ID:Darwin>:_LIBCPP_HARDENING_MODE=_LIBCPP_HARDENING_MODE_FAST>)
if(NOT MOUNT_POINT_INSTRUMENTATION)
  target_compile_options(compiler-options INTERFACE
    $<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-U_FORTIFY_SOURCE>
    $<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-D_FORTIFY_SOURCE=2>)
endif()
target_link_options(compiler-options INTERFACE
  $<$<PLATFORM_ID:Linux>:-Wl,-z,relro,-z,now,-z,noexecstack,-z,separate-code>)

if(MOUNT_POINT_INSTRUMENTATION STREQUAL "address")
  set(instrumentation -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
elseif(MOUNT_POINT_INSTRUMENTATION STREQUAL "thread")
  set(instrumentation -fsanitize=thread -fno-omit-frame-pointer)
elseif(MOUNT_POINT_INSTRUMENTATION STREQUAL "coverage")
  set(instrumentation --coverage -fprofile-update=atomic)
elseif(MOUNT_POINT_INSTRUMENTATION)
  message(FATAL_ERROR "MOUNT_POINT_INSTRUMENTATION is \"${MOUNT_POINT_INSTRUMENTATION}\"; "
    "valid values are address, thread, coverage and the empty string.")
endif()
target_compile_options(compiler-options INTERFACE ${instrumentation})
target_link_options(compiler-options INTERFACE ${instrumentation})
