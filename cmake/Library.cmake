# Defines how the libraries are linked and installed.

include_guard(GLOBAL)
include(CMakePackageConfigHelpers)

# mount_point_library(NAME PUBLIC_NAME DESCRIPTION TEXT [LIBRARIES NAME…])
#
# Adds the static library NAME, without sources, and the target MountPoint::PUBLIC_NAME. Programs link that target,
# which links the whole library. A program may need an object file that no symbol refers to: classes are found by
# name, and class methods by selector. LIBRARIES are the libraries that this one depends on, by their NAME. The library
# is installed as a part of the package MountPoint, and for pkg-config as mount-point-NAME.
function(mount_point_library name public_name)
  cmake_parse_arguments(PARSE_ARGV 2 library "" "DESCRIPTION" "LIBRARIES")
  add_library(${name} STATIC)
  target_include_directories(${name} PUBLIC
    "$<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}>" "$<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/mount-point>")
  target_compile_features(${name} PUBLIC cxx_std_20)
  # The options are not linked, because programs would then inherit the link options. Hosts choose their own.
  target_compile_options(${name} PRIVATE $<TARGET_PROPERTY:MountPoint::Options,INTERFACE_COMPILE_OPTIONS>)
  target_compile_definitions(${name} PRIVATE $<TARGET_PROPERTY:MountPoint::Options,INTERFACE_COMPILE_DEFINITIONS>)
  set_target_properties(${name} PROPERTIES OUTPUT_NAME mount-point-${name} EXPORT_NAME ${public_name}Archive)

  add_library(${name}-whole INTERFACE)
  add_library(MountPoint::${public_name} ALIAS ${name}-whole)
  target_link_libraries(${name}-whole INTERFACE
    "$<BUILD_INTERFACE:$<LINK_LIBRARY:WHOLE_ARCHIVE,${name}>>"
    "$<INSTALL_INTERFACE:$<LINK_LIBRARY:WHOLE_ARCHIVE,MountPoint::${public_name}Archive>>")
  set_target_properties(${name}-whole PROPERTIES EXPORT_NAME ${public_name})
  list(TRANSFORM library_LIBRARIES APPEND "-whole" OUTPUT_VARIABLE below)
  target_link_libraries(${name}-whole INTERFACE ${below})

  # Both sets exist before `mount_point_headers` adds files to them. Headers keep their folder when installed.
  target_sources(${name}
    PUBLIC
      FILE_SET HEADERS BASE_DIRS "${PROJECT_SOURCE_DIR}"
      FILE_SET needed_headers TYPE HEADERS BASE_DIRS "${PROJECT_SOURCE_DIR}")
  install(TARGETS ${name} ${name}-whole EXPORT MountPoint COMPONENT development
    ARCHIVE DESTINATION "${CMAKE_INSTALL_LIBDIR}"
    FILE_SET HEADERS DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/mount-point"
    FILE_SET needed_headers DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/mount-point")

  # The options that link the whole library are a single word, because pkg-config reorders words.
  if(CMAKE_SYSTEM_NAME STREQUAL "Darwin")
    set(libs "-Wl,-force_load,\${libdir}/libmount-point-${name}.a")
  else()
    set(libs "-L\${libdir} -Wl,--whole-archive,-lmount-point-${name},--no-whole-archive")
  endif()
  mount_point_pkg_config(${name} DESCRIPTION "${library_DESCRIPTION}" LIBS "${libs}" LIBRARIES ${library_LIBRARIES})
endfunction()

# mount_point_header_library(NAME PUBLIC_NAME DESCRIPTION TEXT HEADERS FILE… [LIBRARIES NAME…])
#
# Adds a library without sources, whose public headers are HEADERS. The rest is as with mount_point_library.
function(mount_point_header_library name public_name)
  cmake_parse_arguments(PARSE_ARGV 2 library "" "DESCRIPTION" "HEADERS;LIBRARIES")
  add_library(${name} INTERFACE)
  add_library(MountPoint::${public_name} ALIAS ${name})
  list(TRANSFORM library_LIBRARIES APPEND "-whole" OUTPUT_VARIABLE below)
  target_link_libraries(${name} INTERFACE ${below})
  set_target_properties(${name} PROPERTIES EXPORT_NAME ${public_name})
  target_sources(${name} INTERFACE FILE_SET HEADERS BASE_DIRS "${PROJECT_SOURCE_DIR}" FILES ${library_HEADERS})
  install(TARGETS ${name} EXPORT MountPoint COMPONENT development
    FILE_SET HEADERS DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/mount-point")
  mount_point_pkg_config(${name} DESCRIPTION "${library_DESCRIPTION}" LIBRARIES ${library_LIBRARIES})
endfunction()

# mount_point_pkg_config(NAME DESCRIPTION TEXT [LIBS OPTIONS] [LIBRARIES NAME…])
#
# Installs what pkg-config needs for the library NAME, which programs link with OPTIONS.
function(mount_point_pkg_config name)
  cmake_parse_arguments(PARSE_ARGV 1 library "" "DESCRIPTION;LIBS" "LIBRARIES")
  # The prefix is relative to the .pc file, so that the installed tree can be moved.
  set(file "mount-point-${name}")
  set(libs "${library_LIBS}")
  list(TRANSFORM library_LIBRARIES PREPEND "mount-point-" OUTPUT_VARIABLE requires)
  list(JOIN requires ", " requires)
  file(RELATIVE_PATH prefix "/prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/prefix")
  string(REGEX REPLACE "/$" "" prefix "${prefix}")
  configure_file("${PROJECT_SOURCE_DIR}/cmake/library.pc.in" "${PROJECT_BINARY_DIR}/${file}.pc" @ONLY)
  install(FILES "${PROJECT_BINARY_DIR}/${file}.pc" DESTINATION "${CMAKE_INSTALL_LIBDIR}/pkgconfig"
    COMPONENT development)
endfunction()

# mount_point_headers(NAME PUBLIC FILE… [NEEDED FILE…])
#
# Names headers of the library NAME, of this folder. PUBLIC ones are its interface: hosts include them. NEEDED ones lie
# in folders called Private/: public headers include them, for templates and inline functions. Both are installed, and
# nothing else is. `tests/check-headers` compares the lists with the includes.
function(mount_point_headers name)
  cmake_parse_arguments(PARSE_ARGV 1 headers "" "" "PUBLIC;NEEDED")
  target_sources(${name} PUBLIC FILE_SET HEADERS FILES ${headers_PUBLIC})
  target_sources(${name} PUBLIC FILE_SET needed_headers FILES ${headers_NEEDED})
endfunction()

# mount_point_install_package()
#
# Installs what find_package(MountPoint) needs. Call it once, after all libraries have been added.
function(mount_point_install_package)
  set(destination "${CMAKE_INSTALL_LIBDIR}/cmake/MountPoint")
  install(EXPORT MountPoint NAMESPACE MountPoint:: DESTINATION "${destination}" FILE MountPointTargets.cmake
    COMPONENT development)
  configure_package_config_file("${PROJECT_SOURCE_DIR}/cmake/MountPointConfig.cmake.in"
    "${PROJECT_BINARY_DIR}/MountPointConfig.cmake" INSTALL_DESTINATION "${destination}")
  write_basic_package_version_file("${PROJECT_BINARY_DIR}/MountPointConfigVersion.cmake"
    COMPATIBILITY SameMinorVersion)
  install(FILES "${PROJECT_BINARY_DIR}/MountPointConfig.cmake" "${PROJECT_BINARY_DIR}/MountPointConfigVersion.cmake"
    DESTINATION "${destination}" COMPONENT development)
endfunction()
