# Libraries: how they are linked and installed.

include_guard(GLOBAL)
include(CMakePackageConfigHelpers)

# mount_point_library(NAME PUBLIC_NAME)
#
# Adds the static library NAME, without sources, and MountPoint::PUBLIC_NAME, which is what to link. It
# links the library whole: classes are found by name and class methods by selector, so that a file of the
# library may matter to which no symbol leads. Installed, both are of the package MountPoint.
function(mount_point_library name public_name)
  add_library(${name} STATIC)
  target_include_directories(${name} PUBLIC
    "$<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}>" "$<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/mount-point>")
  target_compile_features(${name} PUBLIC cxx_std_20)
  # Not linked, since programs would then be linked with the options too: they choose theirs.
  target_compile_options(${name} PRIVATE $<TARGET_PROPERTY:MountPoint::Options,INTERFACE_COMPILE_OPTIONS>)
  target_compile_definitions(${name} PRIVATE $<TARGET_PROPERTY:MountPoint::Options,INTERFACE_COMPILE_DEFINITIONS>)
  set_target_properties(${name} PROPERTIES OUTPUT_NAME mount-point-${name} EXPORT_NAME ${public_name}Archive)

  add_library(${name}-whole INTERFACE)
  add_library(MountPoint::${public_name} ALIAS ${name}-whole)
  target_link_libraries(${name}-whole INTERFACE
    "$<BUILD_INTERFACE:$<LINK_LIBRARY:WHOLE_ARCHIVE,${name}>>"
    "$<INSTALL_INTERFACE:$<LINK_LIBRARY:WHOLE_ARCHIVE,MountPoint::${public_name}Archive>>")
  set_target_properties(${name}-whole PROPERTIES EXPORT_NAME ${public_name})

  install(TARGETS ${name} ${name}-whole EXPORT MountPoint
    ARCHIVE DESTINATION "${CMAKE_INSTALL_LIBDIR}" COMPONENT development)
  # Headers keep their folder. What differs by system is installed for this system only.
  cmake_path(RELATIVE_PATH CMAKE_CURRENT_SOURCE_DIR BASE_DIRECTORY "${PROJECT_SOURCE_DIR}" OUTPUT_VARIABLE folder)
  install(DIRECTORY "${CMAKE_CURRENT_SOURCE_DIR}/" COMPONENT development
    DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/mount-point/${folder}"
    FILES_MATCHING PATTERN "*.h" PATTERN must-not-compile EXCLUDE PATTERN CMakeFiles EXCLUDE
    PATTERN Linux EXCLUDE PATTERN Darwin EXCLUDE)
  if(IS_DIRECTORY "${CMAKE_CURRENT_SOURCE_DIR}/${CMAKE_SYSTEM_NAME}")
    install(DIRECTORY "${CMAKE_CURRENT_SOURCE_DIR}/${CMAKE_SYSTEM_NAME}" COMPONENT development
      DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}/mount-point/${folder}" FILES_MATCHING PATTERN "*.h")
  endif()
endfunction()

# mount_point_install_package()
#
# Installs what find_package(MountPoint) and pkg-config need. Called once, after all libraries.
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
  # The prefix is told from where the file is, so that the whole may be moved. One word for what is
  # linked whole: pkg-config reorders words.
  file(RELATIVE_PATH pkgconfig_prefix "/prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/prefix")
  string(REGEX REPLACE "/$" "" pkgconfig_prefix "${pkgconfig_prefix}")
  if(CMAKE_SYSTEM_NAME STREQUAL "Darwin")
    set(pkgconfig_libs "-Wl,-force_load,\${libdir}/libmount-point-runtime.a")
  else()
    set(pkgconfig_libs "-L\${libdir} -Wl,--whole-archive,-lmount-point-runtime,--no-whole-archive")
  endif()
  configure_file("${PROJECT_SOURCE_DIR}/cmake/mount-point-runtime.pc.in"
    "${PROJECT_BINARY_DIR}/mount-point-runtime.pc" @ONLY)
  install(FILES "${PROJECT_BINARY_DIR}/mount-point-runtime.pc"
    DESTINATION "${CMAKE_INSTALL_LIBDIR}/pkgconfig" COMPONENT development)
endfunction()
