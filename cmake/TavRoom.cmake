# tav_add_room(ROOM [LIBRARY KOR] [SMALL SOURCE...]): the objects of one folder, `ROOM_objects`. The libraries are put
# together from them, and so is the library that tests link to reach what is not exported.
#
# LIBRARY says which library exports what the room defines: libtav unless it is named.
#
# The sources named after SMALL do nothing that is repeated for every node of a stream, so a release makes them small:
# they run once a handle, once a file access or after damage, and being faster there only costs memory and cache.
function(tav_add_room room)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "LIBRARY" "SMALL")
  if(NOT arg_LIBRARY)
    set(arg_LIBRARY TAV)
  endif()
  file(GLOB sources CONFIGURE_DEPENDS "${CMAKE_CURRENT_SOURCE_DIR}/*.cpp")
  add_library(${room}_objects OBJECT ${sources})
  if(arg_SMALL AND CMAKE_CXX_COMPILER_ID MATCHES "GNU|Clang")
    set_source_files_properties(${arg_SMALL} PROPERTIES COMPILE_OPTIONS $<$<CONFIG:Release>:-Os>)
  endif()
  target_compile_features(${room}_objects PUBLIC cxx_std_20)
  target_compile_definitions(${room}_objects PRIVATE ${arg_LIBRARY}_BUILDING)
  if(WIN32 AND NOT arg_LIBRARY STREQUAL "KOR")
    # The objects serve tav.dll, beside kor.dll, and the tests, which hold both: without imports they link to either.
    target_compile_definitions(${room}_objects PRIVATE KOR_STATIC)
  endif()
  target_include_directories(${room}_objects PUBLIC "${PROJECT_SOURCE_DIR}/include" "${PROJECT_SOURCE_DIR}")
  set_target_properties(${room}_objects PROPERTIES
    CXX_EXTENSIONS OFF
    CXX_VISIBILITY_PRESET hidden
    VISIBILITY_INLINES_HIDDEN ON
    POSITION_INDEPENDENT_CODE ${TAV_POSITION_INDEPENDENT})
  tav_harden(${room}_objects)
endfunction()
