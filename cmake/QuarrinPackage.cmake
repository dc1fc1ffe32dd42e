# What plug-in authors build against once Quarrin is installed: the pkg-config
# file quarrin-plugin.pc and the CMake package Quarrin (target Quarrin::quarrin).
include(CMakePackageConfigHelpers)

set(QUARRIN_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/Quarrin)
set(QUARRIN_PKGCONFIG_DIR ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

# The .pc file finds its prefix from its own place, so an installation that
# is moved or staged under another --prefix still points at itself.
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}" OR IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
  set(QUARRIN_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
  set(QUARRIN_PC_LIBDIR "${CMAKE_INSTALL_FULL_LIBDIR}")
  set(QUARRIN_PC_INCLUDEDIR "${CMAKE_INSTALL_FULL_INCLUDEDIR}")
else()
  file(RELATIVE_PATH up /prefix/${QUARRIN_PKGCONFIG_DIR} /prefix)
  string(REGEX REPLACE "/$" "" up "${up}")
  set(QUARRIN_PC_PREFIX "\${pcfiledir}/${up}")
  set(QUARRIN_PC_LIBDIR "\${prefix}/${CMAKE_INSTALL_LIBDIR}")
  set(QUARRIN_PC_INCLUDEDIR "\${prefix}/${CMAKE_INSTALL_INCLUDEDIR}")
endif()
configure_file(${CMAKE_CURRENT_LIST_DIR}/quarrin-plugin.pc.in
               ${PROJECT_BINARY_DIR}/quarrin-plugin.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/quarrin-plugin.pc DESTINATION ${QUARRIN_PKGCONFIG_DIR})

install(EXPORT QuarrinTargets NAMESPACE Quarrin:: DESTINATION ${QUARRIN_CMAKE_DIR})
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/QuarrinConfig.cmake.in
  ${PROJECT_BINARY_DIR}/QuarrinConfig.cmake INSTALL_DESTINATION ${QUARRIN_CMAKE_DIR})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/QuarrinConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/QuarrinConfig.cmake
              ${PROJECT_BINARY_DIR}/QuarrinConfigVersion.cmake
        DESTINATION ${QUARRIN_CMAKE_DIR})

# quarrin_add_plugin, for plug-in authors and for this tree's own samples, with
# the type UUIDs of the public header and the plug-in folder filled in.
foreach(kind IOM PM PBM)
  file(STRINGS ${PROJECT_SOURCE_DIR}/include/quarrin/plugin.h line
       REGEX "^#define QR_${kind}_TYPE_ID \"")
  string(REGEX MATCH "[0-9A-F-]+\"$" QR_${kind}_TYPE_ID "${line}")
  string(REPLACE "\"" "" QR_${kind}_TYPE_ID "${QR_${kind}_TYPE_ID}")
endforeach()
list(GET QUARRIN_PLUGIN_DIRS 0 QUARRIN_PLUGIN_DIR)
configure_file(${CMAKE_CURRENT_LIST_DIR}/QuarrinPlugin.cmake.in
               ${PROJECT_BINARY_DIR}/QuarrinPlugin.cmake @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/QuarrinPlugin.cmake DESTINATION ${QUARRIN_CMAKE_DIR})
