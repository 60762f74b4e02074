# GoogleTest from its sources, under the names of the installed library: for a build for another machine, or with
# another standard library. A preset asks for it with GTest_DIR.
set(TAV_GTEST_SOURCE "/usr/src/googletest" CACHE PATH "Folder of GoogleTest's sources")
if(TARGET GTest::gmock_main)
  return()
endif()

find_package(Threads REQUIRED)
add_library(tav_gmock STATIC EXCLUDE_FROM_ALL
  "${TAV_GTEST_SOURCE}/googletest/src/gtest-all.cc"
  "${TAV_GTEST_SOURCE}/googlemock/src/gmock-all.cc")
target_include_directories(tav_gmock SYSTEM
  PUBLIC "${TAV_GTEST_SOURCE}/googletest/include" "${TAV_GTEST_SOURCE}/googlemock/include"
  PRIVATE "${TAV_GTEST_SOURCE}/googletest" "${TAV_GTEST_SOURCE}/googlemock")
target_compile_options(tav_gmock PRIVATE -w $<$<CONFIG:Release>:-O1>) # not our sources, and need not be fast
target_link_libraries(tav_gmock PUBLIC Threads::Threads)
add_library(tav_gmock_main STATIC EXCLUDE_FROM_ALL "${TAV_GTEST_SOURCE}/googlemock/src/gmock_main.cc")
target_compile_options(tav_gmock_main PRIVATE -w)
target_link_libraries(tav_gmock_main PUBLIC tav_gmock)
foreach(name IN ITEMS gtest gmock)
  add_library(GTest::${name} ALIAS tav_gmock)
  add_library(GTest::${name}_main ALIAS tav_gmock_main)
endforeach()
