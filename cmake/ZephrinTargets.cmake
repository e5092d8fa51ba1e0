# Helpers for the CMakeLists.txt of each folder.

# zephrin_add_folders(FOLDER/CMakeLists.txt...): add_subdirectory for each, in the given order.
function(zephrin_add_folders)
  foreach(file IN LISTS ARGN)
    cmake_path(GET file PARENT_PATH folder)
    add_subdirectory(${folder})
  endforeach()
endfunction()

# Full target names of platform parts: "value" and "platform_value" both give "platform_value";
# a target of another kind (asio, Threads::Threads) stays what it is.
function(zephrin_platform_targets out)
  set(targets "")
  foreach(name IN LISTS ARGN)
    if(NOT name MATCHES "^platform_|::" AND NOT TARGET ${name})
      set(name platform_${name})
    endif()
    list(APPEND targets ${name})
  endforeach()
  set(${out} ${targets} PARENT_SCOPE)
endfunction()

# zephrin_platform_library(NAME SOURCES... [DEPS...] [PRIVATE_LIBS...])
# The static library platform_NAME (and its objects, for the shared library). DEPS are the platform parts that its headers or sources use;
# PRIVATE_LIBS are libraries that only its sources see. Without a .cpp it is an interface library.
function(zephrin_platform_library name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "" "SOURCES;DEPS;PRIVATE_LIBS")
  zephrin_reject_unparsed("${arg_UNPARSED_ARGUMENTS}")
  zephrin_platform_targets(target ${name})
  zephrin_platform_targets(deps ${arg_DEPS})
  set(compiled ${arg_SOURCES})
  list(FILTER compiled INCLUDE REGEX "\\.cpp$")
  if(compiled)
    add_library(${target}_objects OBJECT ${arg_SOURCES})
    target_link_libraries(${target}_objects PUBLIC ${deps} PRIVATE ${arg_PRIVATE_LIBS})
    add_library(${target} STATIC $<TARGET_OBJECTS:${target}_objects>)
    target_link_libraries(${target} PUBLIC ${deps} PRIVATE ${arg_PRIVATE_LIBS})
  else()
    add_library(${target} INTERFACE)
    target_link_libraries(${target} INTERFACE ${deps} ${arg_PRIVATE_LIBS})
  endif()
endfunction()

# zephrin_client_library(SOURCES... PLATFORM...)
# Makes two targets of the client library's sources:
#   zephrin_core  static; for the daemon and the tests, which link platform parts themselves
#   Zephrin       libZephrin.so, self-contained: all of zephrin_core and of the PLATFORM parts is in
#                 it and exported; for zpctl, the examples and applications. A program that links it
#                 links no platform part besides.
# Parts that PLATFORM does not name come in only as far as the named ones use them.
function(zephrin_client_library)
  cmake_parse_arguments(PARSE_ARGV 0 arg "" "" "SOURCES;PLATFORM;PRIVATE_LIBS")
  zephrin_reject_unparsed("${arg_UNPARSED_ARGUMENTS}")
  zephrin_platform_targets(parts ${arg_PLATFORM})
  add_library(zephrin_objects OBJECT ${arg_SOURCES})
  target_link_libraries(zephrin_objects PUBLIC ${parts} PRIVATE ${arg_PRIVATE_LIBS})

  add_library(zephrin_core STATIC $<TARGET_OBJECTS:zephrin_objects>)
  target_link_libraries(zephrin_core PUBLIC ${parts} PRIVATE ${arg_PRIVATE_LIBS})

  add_library(Zephrin SHARED)
  target_link_libraries(Zephrin PRIVATE zephrin_objects)
  foreach(part IN LISTS parts)
    if(TARGET ${part}_objects)
      target_link_libraries(Zephrin PRIVATE ${part}_objects)
    endif()
  endforeach()
  set_target_properties(Zephrin PROPERTIES
    LINKER_LANGUAGE CXX VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
endfunction()

# zephrin_test(NAME SOURCES... LIBS... [PROGRAMS...] [TIMEOUT SECONDS] [WHOLE] [SERIAL])
# The GoogleTest executable test_NAME. Each test case is one ctest test; with WHOLE the executable
# is one (for suites that share an expensive set-up). PROGRAMS are built first, and their folder is
# the string ZEPHRIN_TEST_PROGRAMS in the sources. With SERIAL nothing runs at the same time.
function(zephrin_test name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "WHOLE;SERIAL" "TIMEOUT" "SOURCES;LIBS;PROGRAMS")
  zephrin_reject_unparsed("${arg_UNPARSED_ARGUMENTS}")
  string(REGEX REPLACE "^test_" "" area ${name})
  set(target test_${area})
  add_executable(${target} ${arg_SOURCES})
  target_link_libraries(${target} PRIVATE ${arg_LIBS} GTest::gmock_main)
  set_target_properties(${target} PROPERTIES
    RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests/bin)
  if(arg_PROGRAMS)
    add_dependencies(${target} ${arg_PROGRAMS})
    target_compile_definitions(${target} PRIVATE
      ZEPHRIN_TEST_PROGRAMS="${CMAKE_RUNTIME_OUTPUT_DIRECTORY}")
  endif()

  if(NOT arg_TIMEOUT)
    set(arg_TIMEOUT 60)
  endif()
  set(properties TIMEOUT ${arg_TIMEOUT})
  if(arg_SERIAL)
    list(APPEND properties RUN_SERIAL TRUE)
  endif()
  if(arg_WHOLE)
    add_test(NAME ${area} COMMAND ${target})
    set_tests_properties(${area} PROPERTIES ${properties})
  else()
    gtest_discover_tests(${target}
      TEST_PREFIX "${area}." DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 60
      PROPERTIES ${properties})
  endif()
endfunction()

# zephrin_fuzz_target(NAME SOURCES... LIBS...)
# The program fuzz_NAME. In the fuzz preset libFuzzer drives it, and `make fuzz` runs every one; in
# other builds with tests it runs the inputs of fuzz/corpus/fuzz_NAME/, as the test fuzz.NAME.
function(zephrin_fuzz_target name)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "" "SOURCES;LIBS")
  zephrin_reject_unparsed("${arg_UNPARSED_ARGUMENTS}")
  string(REGEX REPLACE "^fuzz_" "" area ${name})
  set(target fuzz_${area})
  add_executable(${target} ${arg_SOURCES} Require.cpp)
  target_link_libraries(${target} PRIVATE ${arg_LIBS})
  if(ZEPHRIN_FUZZ)
    target_sources(${target} PRIVATE Entry.cpp)
    target_link_options(${target} PRIVATE -fsanitize=fuzzer)
    add_dependencies(fuzz_targets ${target})
    return()
  endif()
  target_sources(${target} PRIVATE Replay.cpp)
  set_target_properties(${target} PROPERTIES
    RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests/bin)
  add_test(NAME fuzz.${area} COMMAND ${target} ${PROJECT_SOURCE_DIR}/fuzz/corpus/${target})
  set_tests_properties(fuzz.${area} PROPERTIES TIMEOUT 60)
endfunction()

function(zephrin_reject_unparsed arguments)
  if(arguments)
    message(FATAL_ERROR "unknown arguments: ${arguments}")
  endif()
endfunction()
