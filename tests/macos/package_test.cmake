# Packs what was built, installs the package as it says itself, and builds programs against what was installed.
#
# ctest runs this script and sets BUILD, ROOT, WORK, COMPILER, PROCESSOR, CHECK (the command that checks linked files),
# PKG_CONFIG, and LAUNCHER (the command that runs programs for macOS, or nothing).

cmake_minimum_required(VERSION 3.25)
include("${CMAKE_CURRENT_LIST_DIR}/../package/hosts.cmake")

function(expect actual expected)
  if(NOT actual STREQUAL expected)
    message(FATAL_ERROR "Expected:\n${expected}\nFound:\n${actual}")
  endif()
endfunction()

# Neither the caller's umask nor the time nor the folder makes a difference.
file(REMOVE_RECURSE "${WORK}")
run("${ROOT}/script/package" macos "${BUILD}" "${WORK}/first")
set(printed "${output}")
run(sh -c "umask 077 && exec \"$0\" \"$@\"" "${ROOT}/script/package" macos "${BUILD}" "${WORK}/second")
file(GLOB package "${WORK}/first/*")
cmake_path(GET package FILENAME file)
string(REPLACE ".tar.gz" "" name "${file}")
if(NOT name MATCHES "^mount-point-[0-9]+[.][0-9]+[.][0-9]+-macos-${PROCESSOR}$")
  message(FATAL_ERROR "The package is called \"${file}\".")
endif()
file(SHA256 "${package}" first)
file(SHA256 "${WORK}/second/${file}" second)
expect("${second}" "${first}")

# Everything belongs to root. Only the command can be run, without raised privileges at first. There are no folders.
run(tar -tvzf "${package}")
string(REGEX MATCHALL "[^\n]+" entries "${output}")
foreach(entry ${entries})
  if(NOT entry MATCHES "^-rw(-r--r--|xr-xr-x) root/wheel +[0-9]+ .* (${name}/.+)$"
      OR (CMAKE_MATCH_1 STREQUAL "xr-xr-x" AND NOT CMAKE_MATCH_2 STREQUAL "${name}/usr/local/bin/mount-point"))
    message(FATAL_ERROR "The package has a wrong entry: ${entry}")
  endif()
endforeach()
run(tar -tzf "${package}")
string(REGEX MATCHALL "[^\n]+" names "${output}")
set(sorted ${names})
list(SORT sorted)
expect("${names}" "${sorted}")

# It has what an installation has, and a text that says how to install it.
run("${CMAKE_COMMAND}" --install "${BUILD}" --prefix "${WORK}/reference")
file(GLOB_RECURSE reference RELATIVE "${WORK}/reference" "${WORK}/reference/*")
list(TRANSFORM reference PREPEND "${name}/usr/local/")
list(APPEND reference "${name}/INSTALL")
list(SORT reference)
expect("${names}" "${reference}")
foreach(part bin/mount-point share/man/man1/mount-point.1 lib/libmount-point-service-registry.a
    lib/pkgconfig/mount-point-service-registry.pc lib/cmake/MountPoint/MountPointConfig.cmake
    include/mount-point/Shared/ServiceRegistry/ServiceRegistry.h)
  if(NOT "${name}/usr/local/${part}" IN_LIST names)
    message(FATAL_ERROR "The package lacks ${part}.")
  endif()
endforeach()

# The script prints the two commands that INSTALL has. The first one works, here in another folder and without root.
run(tar -xOzf "${package}" "${name}/INSTALL")
string(REGEX MATCHALL "\n    [^\n]+" commands "${output}")
list(TRANSFORM commands STRIP)
list(JOIN commands "\n  " commands)
expect("${printed}" "${package}\n  ${commands}\n")
string(REGEX MATCH "sudo (tar [^\n]+) -C / ([^\n]+)\n  sudo chmod u[+]s /usr/local/bin/mount-point$" found "${commands}")
file(MAKE_DIRECTORY "${WORK}/machine")
run(sh -c "cd '${WORK}/first' && ${CMAKE_MATCH_1} -C '${WORK}/machine' ${CMAKE_MATCH_2}")
run("${CMAKE_COMMAND}" -E compare_files "${BUILD}/tool/mount-point" "${WORK}/machine/usr/local/bin/mount-point")

# The installed files do not depend on the machine that built them, and hosts build against them.
file(RENAME "${WORK}/machine/usr/local" "${WORK}/installed")
file(GLOB_RECURSE texts "${WORK}/installed/*.pc" "${WORK}/installed/*.cmake")
foreach(text ${texts} "${WORK}/installed/bin/mount-point")
  file(READ "${text}" content HEX)
  string(HEX "${ROOT}" path)
  if(content MATCHES "${path}")
    message(FATAL_ERROR "${text} names the folder of the sources.")
  endif()
endforeach()
set(find_package --toolchain "${ROOT}/cmake/macos/toolchain.cmake" "-DMACOS_PROCESSOR=${PROCESSOR}")
set(pkg-config "${COMPILER}")
foreach(way find_package pkg-config)
  build_hosts(${way} ${${way}})
  list(TRANSFORM libraries PREPEND "${WORK}/build/" OUTPUT_VARIABLE hosts)
  run(${CHECK} ${hosts})
  if(LAUNCHER)
    run_hosts(${LAUNCHER})
  endif()
endforeach()
