# Functions that lay bundles out in the build tree. The sources of a bundle's files that are not
# compiled lie in a folder of the bundle's shape: X/Info.plist, X/PlugIns/Y/Info.plist.

set(example_root ${CMAKE_CURRENT_BINARY_DIR})

# zephrin_example_extension_points(IDENTIFIER...): from ExtensionPoints/IDENTIFIER.plist.
function(zephrin_example_extension_points)
  foreach(identifier IN LISTS ARGN)
    configure_file(ExtensionPoints/${identifier}.plist
      ${example_root}/System/Library/ExtensionPoints/${identifier}.plist COPYONLY)
  endforeach()
endfunction()

# zephrin_example_application(NAME SOURCES... LIBS... [RESOURCES...]): Applications/NAME.app.
function(zephrin_example_application name)
  zephrin_example_bundle(${name} ${name} ${example_root}/Applications/${name}.app ${ARGN})
endfunction()

# zephrin_example_plugin(APPLICATION NAME [SOURCES... LIBS...] [RESOURCES...]):
# NAME.appex in the application; without SOURCES a plug-in of data alone.
function(zephrin_example_plugin application name)
  zephrin_example_bundle(${name} ${application}/PlugIns/${name}
    ${example_root}/Applications/${application}.app/PlugIns/${name}.appex ${ARGN})
endfunction()

function(zephrin_example_bundle name from to)
  cmake_parse_arguments(PARSE_ARGV 3 arg "" "" "SOURCES;LIBS;RESOURCES")
  zephrin_reject_unparsed("${arg_UNPARSED_ARGUMENTS}")
  foreach(file IN LISTS arg_RESOURCES ITEMS Info.plist)
    configure_file(${from}/${file} ${to}/${file} COPYONLY)
  endforeach()
  if(arg_SOURCES)
    string(MAKE_C_IDENTIFIER "example_${from}" target)
    add_executable(${target} ${arg_SOURCES})
    target_link_libraries(${target} PRIVATE ${arg_LIBS})
    set_target_properties(${target} PROPERTIES
      OUTPUT_NAME ${name} RUNTIME_OUTPUT_DIRECTORY ${to})
  endif()
endfunction()
