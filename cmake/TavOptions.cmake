# The options, and the flags that hold for everything when the project is built for itself. As a part of another
# project it adds nothing but its libraries and leaves that project's flags alone.

option(TAV_BUILD_TESTS "Build the tests" ${PROJECT_IS_TOP_LEVEL})
option(TAV_BUILD_EXAMPLES "Build the examples" ${PROJECT_IS_TOP_LEVEL})
option(TAV_BUILD_TOOLS "Build the command line program" ${PROJECT_IS_TOP_LEVEL})
option(TAV_BUILD_BENCH "Build the benchmarks" OFF)
option(TAV_BUILD_WEB "Build the module of the page; needs emscripten, see the preset page" OFF)
option(TAV_BUILD_PYTHON "Build the Python package" OFF)
option(TAV_BUILD_DUCKDB "Build the extension for DuckDB" OFF)
option(TAV_INSTALL "Add the libraries to what is installed" ${PROJECT_IS_TOP_LEVEL})
option(TAV_WERROR "Treat warnings as errors" ${PROJECT_IS_TOP_LEVEL})
option(TAV_FUZZ "Drive the programs of fuzz/ by libFuzzer; needs clang and fuzzer-no-link in TAV_SANITIZE" OFF)
set(TAV_TEST_OPTIMIZATION "-O0" CACHE STRING "How far the tests themselves are optimised")
set(TAV_SANITIZE "" CACHE STRING "Sanitizers, as -fsanitize takes them: address,undefined or thread")

# Shared unless BUILD_SHARED_LIBS says otherwise; the variable itself is the surrounding project's.
if(DEFINED BUILD_SHARED_LIBS AND NOT BUILD_SHARED_LIBS)
  set(TAV_LIBRARY_TYPE STATIC)
else()
  set(TAV_LIBRARY_TYPE SHARED)
endif()

# Static libraries may end up in shared ones, but of a module of WebAssembly nothing moves.
if(EMSCRIPTEN)
  set(TAV_POSITION_INDEPENDENT OFF)
else()
  set(TAV_POSITION_INDEPENDENT ON)
endif()

if(PROJECT_IS_TOP_LEVEL)
  set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
  set(CMAKE_CXX_STANDARD 20)
  set(CMAKE_CXX_STANDARD_REQUIRED ON)
  set(CMAKE_CXX_EXTENSIONS OFF)
  # Programs find the libraries of the build from where they lie themselves: of an absolute path the length would stay in
  # what is installed, and the same sources would give other bytes in another folder.
  set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)
  if(WIN32)
    # Programs find their libraries beside them.
    set(CMAKE_RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/bin")
  endif()
  if(NOT CMAKE_BUILD_TYPE AND NOT CMAKE_CONFIGURATION_TYPES)
    set(CMAKE_BUILD_TYPE Release CACHE STRING "Kind of build" FORCE)
  endif()
  if(CMAKE_CXX_COMPILER_ID MATCHES "GNU|Clang")
    add_compile_options(-Wall -Wextra -Wpedantic -Wconversion -Wshadow)
    if(TAV_WERROR)
      add_compile_options(-Werror)
    endif()
  endif()
endif()

if(TAV_SANITIZE)
  # The whole program has to agree on them, so they are no property of single targets.
  add_compile_options(-fsanitize=${TAV_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${TAV_SANITIZE})
endif()

# The standard library's headers compiled once, for a build from scratch that is to be there soon.
option(TAV_PRECOMPILE "Precompile the standard library's headers for inspect and tools" OFF)
function(tav_precompile target)
  if(TAV_PRECOMPILE)
    target_precompile_headers(${target} PRIVATE <algorithm> <array> <charconv> <functional> <map> <memory>
      <optional> <span> <string> <system_error> <unordered_map> <vector>)
  endif()
endfunction()
