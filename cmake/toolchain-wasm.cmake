# WebAssembly: 32-bit memory, 64-bit offsets, by emscripten; programs run under node.
find_program(TAV_EM_CONFIG em-config REQUIRED)
execute_process(COMMAND "${TAV_EM_CONFIG}" EMSCRIPTEN_ROOT
  OUTPUT_VARIABLE root OUTPUT_STRIP_TRAILING_WHITESPACE COMMAND_ERROR_IS_FATAL ANY)
include("${root}/cmake/Modules/Platform/Emscripten.cmake")
find_program(TAV_NODE NAMES node nodejs REQUIRED)
# What emscripten 3.1 writes takes a file for an address to fetch from where node has a fetch.
set(CMAKE_CROSSCOMPILING_EMULATOR "${TAV_NODE};--no-experimental-fetch")
