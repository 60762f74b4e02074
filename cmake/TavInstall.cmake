# Headers, libraries, the CMake package and the pkg-config files. All paths are relative to where the files lie, so that
# an installed prefix can be moved.
if(NOT TAV_INSTALL)
  return()
endif()
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

# The inspection library changes more often than libtav, which most programs need alone: a component of its own.
install(TARGETS kor tav
  EXPORT tavTargets
  RUNTIME COMPONENT runtime
  LIBRARY COMPONENT runtime NAMELINK_COMPONENT development
  ARCHIVE COMPONENT development)
install(TARGETS tav_inspect
  EXPORT tavTargets
  RUNTIME COMPONENT inspection
  LIBRARY COMPONENT inspection NAMELINK_COMPONENT development
  ARCHIVE COMPONENT development)
install(DIRECTORY include/tav
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  COMPONENT development
  FILES_MATCHING PATTERN "*.h" PATTERN "*.hpp" PATTERN "*.cppm" PATTERN "*.def")

set(packageDir "${CMAKE_INSTALL_LIBDIR}/cmake/tav")
install(EXPORT tavTargets NAMESPACE tav:: DESTINATION ${packageDir} COMPONENT development)
configure_package_config_file(cmake/tavConfig.cmake.in tavConfig.cmake INSTALL_DESTINATION ${packageDir})
write_basic_package_version_file(tavConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(FILES "${PROJECT_BINARY_DIR}/tavConfig.cmake" "${PROJECT_BINARY_DIR}/tavConfigVersion.cmake"
  DESTINATION ${packageDir}
  COMPONENT development)

# tav_install_pkgconfig(NAME DESCRIPTION REQUIRES LIBS_PRIVATE)
function(tav_install_pkgconfig PC_NAME PC_DESCRIPTION PC_REQUIRES PC_LIBS_PRIVATE)
  set(pkgConfigDir "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
  if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}")
    set(PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
    set(PC_LIBDIR "${CMAKE_INSTALL_LIBDIR}")
  else()
    file(RELATIVE_PATH up "/prefix/${pkgConfigDir}" "/prefix")
    string(REGEX REPLACE "/$" "" up "${up}")
    set(PC_PREFIX "\${pcfiledir}/${up}")
    set(PC_LIBDIR "\${prefix}/${CMAKE_INSTALL_LIBDIR}")
  endif()
  if(IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
    set(PC_INCLUDEDIR "${CMAKE_INSTALL_INCLUDEDIR}")
  else()
    set(PC_INCLUDEDIR "\${prefix}/${CMAKE_INSTALL_INCLUDEDIR}")
  endif()
  set(PC_CFLAGS)
  if(TAV_LIBRARY_TYPE STREQUAL "STATIC" AND NOT PC_NAME STREQUAL "tav-inspect") # which follows libtav
    string(TOUPPER ${PC_NAME} upper)
    set(PC_CFLAGS " -D${upper}_STATIC")
  endif()
  configure_file(cmake/pkgconfig.pc.in ${PC_NAME}.pc @ONLY)
  install(FILES "${PROJECT_BINARY_DIR}/${PC_NAME}.pc" DESTINATION ${pkgConfigDir} COMPONENT development)
endfunction()

tav_install_pkgconfig(kor "Portability layer of libtav: memory, files, threads and the trace facility" ""
  "${CMAKE_THREAD_LIBS_INIT}")
tav_install_pkgconfig(tav "${PROJECT_DESCRIPTION}" "kor = ${PROJECT_VERSION}" "")
tav_install_pkgconfig(tav-inspect "Inspection of tav streams: recognise, walk, check, recover, compare, convert" "tav = ${PROJECT_VERSION}" "")
