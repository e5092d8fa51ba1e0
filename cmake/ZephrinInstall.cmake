# What `make install` puts where. The root lists the programs and the library.

include(GNUInstallDirs)

set(CMAKE_INSTALL_RPATH "$ORIGIN/../${CMAKE_INSTALL_LIBDIR}")

function(zephrin_install_program target)
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
