# Libraries of headers alone, for a build for another machine: their packages lie among this machine's headers, which
# such a build must not see as a whole. A folder with links to the wanted ones takes their place.

# tav_header_only(TARGET FOLDER FIND_PACKAGE_NAME): the imported target TARGET, whose headers are FOLDER/...
function(tav_header_only target folder package)
  if(NOT CMAKE_CROSSCOMPILING)
    find_package(${package} REQUIRED)
    return()
  endif()
  set(place "${PROJECT_BINARY_DIR}/headers/${package}")
  find_path(${package}_HEADERS ${folder} PATHS /usr/include NO_CMAKE_FIND_ROOT_PATH REQUIRED)
  file(MAKE_DIRECTORY "${place}")
  file(CREATE_LINK "${${package}_HEADERS}/${folder}" "${place}/${folder}" SYMBOLIC)
  add_library(${target} INTERFACE IMPORTED)
  target_include_directories(${target} SYSTEM INTERFACE "${place}")
endfunction()
