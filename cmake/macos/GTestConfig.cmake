# Compiles GoogleTest from the sources in Debian's package `googletest`. The libraries that Debian has are for Linux.

if(TARGET GTest::gmock)
  return()
endif()

set(folder /usr/src/googletest)
add_library(gmock STATIC "${folder}/googletest/src/gtest-all.cc" "${folder}/googlemock/src/gmock-all.cc")
target_include_directories(gmock SYSTEM PUBLIC "${folder}/googletest/include" "${folder}/googlemock/include")
target_include_directories(gmock PRIVATE "${folder}/googletest" "${folder}/googlemock")
target_compile_features(gmock PUBLIC cxx_std_20)
add_library(GTest::gmock ALIAS gmock)

add_library(gtest_main STATIC "${folder}/googlemock/src/gmock_main.cc")
target_link_libraries(gtest_main PUBLIC gmock)
add_library(GTest::gtest_main ALIAS gtest_main)
