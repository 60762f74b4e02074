# Debian packages: libtav1 (libtav and libkor), libtav-inspect1 (the inspection library), libtav-dev (headers, CMake
# package, pkg-config of all three), tav-tools (the program), python3-tav (the Python package, where it is built).
#   cmake --preset package && cmake --build --preset package && cpack --config build/package/CPackConfig.cmake
# cmake/check-packages.sh does that, and installs, runs and removes them in a fresh root.
if(NOT TAV_INSTALL OR NOT TAV_LIBRARY_TYPE STREQUAL "SHARED")
  return()
endif()
include(TavReleased)
if(NOT TAV_RELEASED)
  return()
endif()
find_program(GZIP gzip)
if(NOT GZIP)
  return()
endif()

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME tav)
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "hierarchical, self-describing binary streams")
set(CPACK_PACKAGE_VENDOR "the tav authors")
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_CONTACT "the tav authors <tav-authors@users.noreply.tav.example>")
set(CPACK_PACKAGE_FILE_NAME tav)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL runtime inspection development tools)
set(CPACK_COMPONENTS_GROUPING ONE_PER_GROUP)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)

set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS "${PROJECT_BINARY_DIR}")
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)

set(about "tav streams are trees of nodes laid end to end, each with a header\n\
that tells its size, its type and what it holds.\n\n")
set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME libtav${TAV_ABI_VERSION})
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_CONTROL_EXTRA "${PROJECT_SOURCE_DIR}/packaging/triggers")
set(CPACK_COMPONENT_RUNTIME_DESCRIPTION "${about}This package has the shared libraries.")

set(CPACK_DEBIAN_INSPECTION_PACKAGE_NAME libtav-inspect${TAV_ABI_VERSION})
set(CPACK_DEBIAN_INSPECTION_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_INSPECTION_PACKAGE_CONTROL_EXTRA "${PROJECT_SOURCE_DIR}/packaging/triggers")
set(CPACK_DEBIAN_INSPECTION_PACKAGE_DEPENDS "libtav${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1)")
set(CPACK_COMPONENT_INSPECTION_DESCRIPTION "${about}This package has the shared library that looks into streams of unknown form,\n\
checks, converts, compares and recovers them.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libtav-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS
  "libtav${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1), libtav-inspect${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1)")
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "${about}This package has the headers, the CMake package and the pkg-config\nfiles.")

set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME tav-tools)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_TOOLS_PACKAGE_DEPENDS
  "libtav${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1), libtav-inspect${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1)")
set(CPACK_COMPONENT_TOOLS_DESCRIPTION "${about}This package has the program tav, which looks into streams, checks,\n\
converts and recovers them, its man page and its completions.")

if(TAV_BUILD_PYTHON)
  find_package(Python3 3.11 REQUIRED COMPONENTS Interpreter)
  list(APPEND CPACK_COMPONENTS_ALL python)
  set(CPACK_DEBIAN_PYTHON_PACKAGE_NAME python3-tav)
  set(CPACK_DEBIAN_PYTHON_PACKAGE_SECTION python)
  math(EXPR next "${Python3_VERSION_MINOR} + 1")
  set(CPACK_DEBIAN_PYTHON_PACKAGE_DEPENDS "libtav${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1), \
libtav-inspect${TAV_ABI_VERSION} (= ${PROJECT_VERSION}-1), \
python3 (>= 3.${Python3_VERSION_MINOR}), python3 (<< 3.${next})")
  set(CPACK_DEBIAN_PYTHON_PACKAGE_SUGGESTS "python3-numpy, python3-pandas, python3-dask, python3-distributed")
  # What Python compiles of the modules goes with them.
  set(CPACK_DEBIAN_PYTHON_PACKAGE_CONTROL_EXTRA "${PROJECT_SOURCE_DIR}/packaging/python/postinst"
    "${PROJECT_SOURCE_DIR}/packaging/python/prerm")
  set(CPACK_COMPONENT_PYTHON_DESCRIPTION "${about}This package has the module tav for Python, which reads, writes and\n\
examines them.")
endif()

# What Debian asks of every package: its licence and its history.
set(history "${PROJECT_BINARY_DIR}/changelog.Debian")
set(released "${TAV_RELEASED}")
configure_file(packaging/changelog.in "${history}" @ONLY)
add_custom_command(OUTPUT "${history}.gz"
  COMMAND ${GZIP} -9nkf "${history}"
  DEPENDS "${history}"
  VERBATIM)
add_custom_target(package_history ALL DEPENDS "${history}.gz")
set(documented "runtime\;libtav${TAV_ABI_VERSION}" "inspection\;libtav-inspect${TAV_ABI_VERSION}"
  "development\;libtav-dev" "tools\;tav-tools")
if(TAV_BUILD_PYTHON)
  list(APPEND documented "python\;python3-tav")
endif()
foreach(pair IN LISTS documented)
  list(GET pair 0 component)
  list(GET pair 1 package)
  install(FILES packaging/copyright "${history}.gz"
    DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/${package}
    COMPONENT ${component})
endforeach()

include(CPack)
