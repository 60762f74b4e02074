# libkor, libtav and libtav-inspect from the rooms' objects, and tav_internal for the tests and
# for what holds them all.

# tav_add_library(NAME ALIAS ROOM...): the library and its name for users, tav::ALIAS.
function(tav_add_library name alias)
  set(objects)
  foreach(room IN LISTS ARGN)
    list(APPEND objects $<TARGET_OBJECTS:${room}_objects>)
  endforeach()
  add_library(${name} ${TAV_LIBRARY_TYPE} ${objects})
  add_library(tav::${alias} ALIAS ${name})
  target_compile_features(${name} PUBLIC cxx_std_20)
  target_include_directories(${name} PUBLIC
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include>
    $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
  set_target_properties(${name} PROPERTIES
    LINKER_LANGUAGE CXX
    VERSION ${TAV_ABI_VERSION}.${PROJECT_VERSION}
    SOVERSION ${TAV_ABI_VERSION})
  tav_harden(${name})
  if(TAV_LIBRARY_TYPE STREQUAL "STATIC")
    string(TOUPPER ${name} upper)
    if(NOT name STREQUAL "tav_inspect") # which follows libtav
      target_compile_definitions(${name} PUBLIC ${upper}_STATIC)
    endif()
  elseif(WIN32)
    target_sources(${name} PRIVATE $<TARGET_OBJECTS:module_entry>)
    # The names on both platforms are those of the library alone: tav.dll, libtav.so.
    set_target_properties(${name} PROPERTIES PREFIX "")
  elseif(UNIX AND NOT APPLE)
    # Instances of the standard library's templates have its visibility, not ours; keep them inside.
    target_link_options(${name} PRIVATE "LINKER:--version-script=${PROJECT_SOURCE_DIR}/cmake/hide-std.map")
    set_property(TARGET ${name} APPEND PROPERTY LINK_DEPENDS "${PROJECT_SOURCE_DIR}/cmake/hide-std.map")
    if(NOT TAV_SANITIZE)
      target_link_options(${name} PRIVATE LINKER:-z,defs)
    endif()
  endif()
endfunction()

include(GNUInstallDirs)
tav_add_library(kor kor kor trace)
target_link_libraries(kor PRIVATE Threads::Threads)
tav_add_library(tav tav format storage dictionary api layer)
target_link_libraries(tav PUBLIC kor)
tav_add_library(tav_inspect inspect inspect)
target_link_libraries(tav_inspect PUBLIC tav)
set_target_properties(tav_inspect PROPERTIES OUTPUT_NAME tav-inspect EXPORT_NAME inspect)

if(TAV_BUILD_TESTS OR TAV_BUILD_BENCH OR TAV_BUILD_DUCKDB)
  set(objects)
  foreach(room IN LISTS TAV_ROOMS ITEMS inspect)
    list(APPEND objects $<TARGET_OBJECTS:${room}_objects>)
  endforeach()
  add_library(tav_internal STATIC EXCLUDE_FROM_ALL ${objects})
  target_compile_features(tav_internal PUBLIC cxx_std_20)
  target_compile_definitions(tav_internal INTERFACE KOR_STATIC TAV_STATIC)
  target_include_directories(tav_internal INTERFACE "${PROJECT_SOURCE_DIR}/include" "${PROJECT_SOURCE_DIR}")
  target_link_libraries(tav_internal PUBLIC Threads::Threads)
  set_target_properties(tav_internal PROPERTIES LINKER_LANGUAGE CXX)
endif()
