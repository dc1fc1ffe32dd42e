# Plug-in bundles built in the build tree, laid out as an installation holds them:
#
#   <BUNDLE>/Contents/Info.plist
#   <BUNDLE>/Contents/Linux/<name>.so
#   <BUNDLE>/Contents/Resources/...
#
# quarrin_add_plugin_bundle(<target>
#     BUNDLE <absolute directory, e.g. .../Printers/Foo.plugin>
#     KIND iom|pm|pbm                plug-in type declared in CFPlugInTypes
#     FACTORY <uuid> FUNCTION <name> the one factory and the C function behind it
#     IDENTIFIER <id> VERSION <short version>
#     SOURCES <file>...
#     [DEFINES <definition>...]
#     [RESOURCES <file>[=<path in Resources>]...])
#
# C sources get -fexceptions, so QrRaise can unwind through them.

set(QUARRIN_BUNDLE_INFO_TEMPLATE ${CMAKE_CURRENT_LIST_DIR}/QuarrinBundleInfo.plist.in)

# The plug-in type UUIDs as the public header spells them.
function(quarrin_plugin_type_id kind out)
  string(TOUPPER ${kind} kind)
  file(STRINGS ${PROJECT_SOURCE_DIR}/include/quarrin/plugin.h line
       REGEX "^#define QR_${kind}_TYPE_ID \"")
  if(NOT line MATCHES "\"([0-9A-F-]+)\"")
    message(FATAL_ERROR "no plug-in type UUID for kind '${kind}'")
  endif()
  set(${out} ${CMAKE_MATCH_1} PARENT_SCOPE)
endfunction()

function(quarrin_add_plugin_bundle target)
  cmake_parse_arguments(PARSE_ARGV 1 arg ""
    "BUNDLE;KIND;FACTORY;FUNCTION;IDENTIFIER;VERSION" "SOURCES;DEFINES;RESOURCES")
  foreach(required BUNDLE KIND FACTORY FUNCTION IDENTIFIER VERSION SOURCES)
    if(NOT arg_${required})
      message(FATAL_ERROR "quarrin_add_plugin_bundle(${target}): ${required} is required")
    endif()
  endforeach()

  get_filename_component(name ${arg_BUNDLE} NAME_WE)
  set(contents ${arg_BUNDLE}/Contents)
  file(MAKE_DIRECTORY ${contents}/Linux ${contents}/Resources)

  set(BUNDLE_EXECUTABLE ${name}.so)
  set(BUNDLE_IDENTIFIER ${arg_IDENTIFIER})
  set(BUNDLE_VERSION ${arg_VERSION})
  set(BUNDLE_FACTORY ${arg_FACTORY})
  set(BUNDLE_FUNCTION ${arg_FUNCTION})
  quarrin_plugin_type_id(${arg_KIND} BUNDLE_TYPE)
  configure_file(${QUARRIN_BUNDLE_INFO_TEMPLATE} ${contents}/Info.plist @ONLY)

  foreach(resource IN LISTS arg_RESOURCES)
    if(resource MATCHES "^([^=]*)=(.*)$")
      set(source ${CMAKE_MATCH_1})
      set(dest ${CMAKE_MATCH_2})
    else()
      set(source ${resource})
      get_filename_component(dest ${resource} NAME)
    endif()
    get_filename_component(source ${source} ABSOLUTE)
    configure_file(${source} ${contents}/Resources/${dest} COPYONLY)
  endforeach()

  add_library(${target} MODULE ${arg_SOURCES})
  set_target_properties(${target} PROPERTIES
    PREFIX "" OUTPUT_NAME ${name} SUFFIX .so
    LIBRARY_OUTPUT_DIRECTORY ${contents}/Linux
    C_VISIBILITY_PRESET hidden)
  target_compile_definitions(${target} PRIVATE ${arg_DEFINES})
  target_compile_options(${target} PRIVATE $<$<COMPILE_LANGUAGE:C>:-fexceptions>)
  target_link_libraries(${target} PRIVATE quarrin)
endfunction()
