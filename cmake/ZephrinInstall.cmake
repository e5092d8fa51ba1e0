# What `make install` puts where. The root lists the programs and the library.

include(GNUInstallDirs)

# Programs find the library from where they lie themselves, also in the build tree. A path that is
# edited when it is installed would end in an empty element until then, which the loader takes for
# the working directory.
function(zephrin_install_program target)
  set_target_properties(${target} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON
    INSTALL_RPATH "$ORIGIN/../${CMAKE_INSTALL_LIBDIR};$ORIGIN/../lib")
  install(TARGETS ${target} RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endfunction()

# The library and the headers below the given folders, at the paths by which they are included.
function(zephrin_install_library target)
  install(TARGETS ${target} LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
  foreach(folder IN LISTS ARGN)
    install(DIRECTORY ${PROJECT_SOURCE_DIR}/${folder}/
      DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/zephrin/${folder}
      FILES_MATCHING PATTERN "*.h")
  endforeach()
endfunction()

# docs/man/NAME.SECTION, each where man(1) looks for its section.
function(zephrin_install_manuals)
  file(GLOB pages CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/docs/man/*.[1-9])
  foreach(page IN LISTS pages)
    cmake_path(GET page EXTENSION LAST_ONLY section)
    string(SUBSTRING ${section} 1 -1 section)
    install(FILES ${page} DESTINATION ${CMAKE_INSTALL_MANDIR}/man${section})
  endforeach()
endfunction()
