# A C compiler, where there is one for the machine that is built for: the libraries need none, examples and tests in C
# do. Sanitizers are the C++ compiler's, whose C compiler may be another.
set(TAV_HAS_C OFF)
if((TAV_BUILD_TESTS OR TAV_BUILD_EXAMPLES) AND NOT CMAKE_CROSSCOMPILING AND NOT TAV_SANITIZE)
  include(CheckLanguage)
  check_language(C)
  if(CMAKE_C_COMPILER)
    enable_language(C)
    set(TAV_HAS_C ON)
  endif()
endif()

# tav_add_c_program(NAME SOURCE): a program in C99 that needs nothing but tav_c.h and its library.
function(tav_add_c_program name source)
  add_executable(${name} ${source})
  target_link_libraries(${name} PRIVATE tav::inspect)
  set_target_properties(${name} PROPERTIES C_STANDARD 99 C_STANDARD_REQUIRED ON C_EXTENSIONS OFF)
  if(TAV_LIBRARY_TYPE STREQUAL "STATIC" OR CMAKE_CXX_FLAGS MATCHES "--coverage")
    set_target_properties(${name} PROPERTIES LINKER_LANGUAGE CXX)
  endif()
endfunction()
