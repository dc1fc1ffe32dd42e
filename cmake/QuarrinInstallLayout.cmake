# What an installation lays down for the programs to find: the printing
# framework bundle at QUARRIN_FRAMEWORK_DIR, whose module search settings name
# the folders of QUARRIN_PLUGIN_DIRS, and those folders, empty. Its default
# cache is empty too; without one a first run logs that it found none.
#
# A path under the configured prefix is installed relative to it, so that an
# install into another prefix (cmake --install --prefix) stays inside that
# prefix, and the search settings, written at install time, name the folders
# where they were laid down. DESTDIR staging keeps the configured paths.

function(quarrin_install_destination out path)
  cmake_path(IS_PREFIX CMAKE_INSTALL_PREFIX "${path}" NORMALIZE under)
  if(under)
    cmake_path(RELATIVE_PATH path BASE_DIRECTORY "${CMAKE_INSTALL_PREFIX}")
  endif()
  set(${out} "${path}" PARENT_SCOPE)
endfunction()

set(QUARRIN_SEARCH_DIRECTORIES "")
foreach(folder ${QUARRIN_PLUGIN_DIRS})
  quarrin_install_destination(destination "${folder}")
  install(DIRECTORY DESTINATION "${destination}")
  if(NOT IS_ABSOLUTE "${destination}")
    # Filled in with the prefix of the install, not of the configuration.
    set(destination "@CMAKE_INSTALL_PREFIX@/${destination}")
  endif()
  string(REPLACE "&" "&amp;" destination "${destination}")
  string(REPLACE "<" "&lt;" destination "${destination}")
  string(APPEND QUARRIN_SEARCH_DIRECTORIES "\t\t<string>${destination}</string>\n")
endforeach()
configure_file(${CMAKE_CURRENT_LIST_DIR}/com.varnex.pm.xml.in
               ${PROJECT_BINARY_DIR}/com.varnex.pm.xml.in @ONLY)

quarrin_install_destination(framework "${QUARRIN_FRAMEWORK_DIR}")
configure_file(${CMAKE_CURRENT_LIST_DIR}/framework-Info.plist.in
               ${PROJECT_BINARY_DIR}/framework-Info.plist @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/framework-Info.plist
        DESTINATION "${framework}/Contents" RENAME Info.plist)
install(FILES ${CMAKE_CURRENT_LIST_DIR}/com.varnex.pmcache.xml
        DESTINATION "${framework}/Contents/Resources")

if(IS_ABSOLUTE "${framework}")
  set(framework "\$ENV{DESTDIR}${framework}")
else()
  set(framework "\$ENV{DESTDIR}\${CMAKE_INSTALL_PREFIX}/${framework}")
endif()
install(CODE "
  file(READ [[${PROJECT_BINARY_DIR}/com.varnex.pm.xml.in]] settings)
  string(CONFIGURE \"\${settings}\" settings @ONLY)
  set(to \"${framework}/Contents/Resources/com.varnex.pm.xml\")
  message(STATUS \"Installing: \${to}\")
  file(WRITE \"\${to}\" \"\${settings}\")
  list(APPEND CMAKE_INSTALL_MANIFEST_FILES \"\${to}\")
")
