# What is installed is hardened as Debian hardens its packages (`dpkg-buildflags` with hardening=+all), and with what later
# releases of it add: checked stacks and copies, tables of addresses that are read-only once a program runs, and marks
# for processors that check where jumps lead. tests/system/install/hardening.sh reads it back from the binaries.
include(CheckCXXCompilerFlag)

option(TAV_HARDEN "Harden the libraries and the program" ${PROJECT_IS_TOP_LEVEL})

set(TAV_HARDENED OFF)
if(TAV_HARDEN AND UNIX AND NOT APPLE AND NOT EMSCRIPTEN AND NOT TAV_SANITIZE AND CMAKE_CXX_COMPILER_ID MATCHES "GNU|Clang")
  set(TAV_HARDENED ON)
  set(TAV_HARDEN_FLAGS -fstack-protector-strong -Wformat -Werror=format-security)
  foreach(flag IN ITEMS -fstack-clash-protection -fcf-protection) # not every processor has them
    string(MAKE_C_IDENTIFIER "TAV_HAS${flag}" has)
    check_cxx_compiler_flag("-Werror ${flag}" ${has})
    if(${has})
      list(APPEND TAV_HARDEN_FLAGS ${flag})
    endif()
  endforeach()
  if(NOT CMAKE_CXX_FLAGS MATCHES "_FORTIFY_SOURCE")
    list(APPEND TAV_HARDEN_FLAGS
      "$<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-U_FORTIFY_SOURCE>" # some compilers bring a level of their own
      "$<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-D_FORTIFY_SOURCE=2>")
  endif()
endif()

# tav_harden(TARGET): the flags of one target.
function(tav_harden target)
  if(NOT TAV_HARDENED)
    return()
  endif()
  target_compile_options(${target} PRIVATE ${TAV_HARDEN_FLAGS})
  get_target_property(type ${target} TYPE)
  if(type STREQUAL "EXECUTABLE" OR type STREQUAL "SHARED_LIBRARY" OR type STREQUAL "MODULE_LIBRARY")
    target_link_options(${target} PRIVATE LINKER:-z,relro LINKER:-z,now)
  endif()
  if(type STREQUAL "EXECUTABLE")
    target_link_options(${target} PRIVATE -pie)
  endif()
endfunction()
