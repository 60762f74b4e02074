# tav_add_room(ROOM): the objects of one folder of the library, `ROOM_objects`. The libraries are put together from
# them, and so is the library that tests link to reach what is not exported.
function(tav_add_room room)
  file(GLOB sources CONFIGURE_DEPENDS "${CMAKE_CURRENT_SOURCE_DIR}/*.cpp")
  add_library(${room}_objects OBJECT ${sources})
  target_compile_features(${room}_objects PUBLIC cxx_std_20)
  target_compile_definitions(${room}_objects PRIVATE TAV_BUILDING)
  target_include_directories(${room}_objects PUBLIC "${PROJECT_SOURCE_DIR}/include" "${PROJECT_SOURCE_DIR}")
  set_target_properties(${room}_objects PROPERTIES
    CXX_EXTENSIONS OFF
    CXX_VISIBILITY_PRESET hidden
    VISIBILITY_INLINES_HIDDEN ON
    POSITION_INDEPENDENT_CODE ON)
endfunction()
