# Builds for macOS on Linux, for the processor MACOS_PROCESSOR (x86_64 or arm64), with the tools of
# `script/bootstrap macos`. The presets `macos` and `macos-arm64` use it.

if(NOT EXISTS "${CMAKE_CURRENT_LIST_DIR}/../../build/macos-tools/version")
  message(FATAL_ERROR "The tools for macOS are missing. Run: script/bootstrap macos")
endif()

set(CMAKE_SYSTEM_NAME Darwin)
set(CMAKE_SYSTEM_PROCESSOR ${MACOS_PROCESSOR})
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES MACOS_PROCESSOR)

set(CMAKE_CXX_COMPILER "${CMAKE_CURRENT_LIST_DIR}/${MACOS_PROCESSOR}-apple-macos-clang++")
set(CMAKE_AR "${CMAKE_CURRENT_LIST_DIR}/ar" CACHE FILEPATH "")
set(CMAKE_RANLIB "${CMAKE_CURRENT_LIST_DIR}/ranlib" CACHE FILEPATH "")
# CMake insists on a program that changes installed shared libraries. The project installs none.
set(CMAKE_INSTALL_NAME_TOOL /bin/false CACHE FILEPATH "")
# The compiler is told where everything is, so there is no folder with the system's files.
set(CMAKE_OSX_SYSROOT "" CACHE STRING "")

# Debian has the sources of GoogleTest, and GTestConfig.cmake compiles them.
set(GTest_DIR "${CMAKE_CURRENT_LIST_DIR}")

set(CMAKE_FIND_ROOT_PATH "${CMAKE_CURRENT_LIST_DIR}")
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE BOTH)
