# An overlay port: it builds the checkout that it lies in.
#   vcpkg install tav --overlay-ports=packaging/vcpkg
get_filename_component(SOURCE_PATH "${CMAKE_CURRENT_LIST_DIR}/../.." ABSOLUTE)

vcpkg_cmake_configure(
  SOURCE_PATH "${SOURCE_PATH}"
  OPTIONS
    -DTAV_INSTALL=ON
    -DTAV_BUILD_TESTS=OFF
    -DTAV_BUILD_TOOLS=OFF
    -DTAV_BUILD_EXAMPLES=OFF
    -DTAV_WERROR=OFF)
vcpkg_cmake_install()
vcpkg_cmake_config_fixup(PACKAGE_NAME tav CONFIG_PATH lib/cmake/tav)
vcpkg_fixup_pkgconfig()
file(REMOVE_RECURSE "${CURRENT_PACKAGES_DIR}/debug/include")
vcpkg_install_copyright(FILE_LIST "${SOURCE_PATH}/LICENSE")
