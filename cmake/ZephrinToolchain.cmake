# Compiler settings that every target of the project shares.

set(CMAKE_CXX_STANDARD 23)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)

# Everything may end up in the shared library.
set(CMAKE_POSITION_INDEPENDENT_CODE ON)

set(CMAKE_RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/bin)
set(CMAKE_LIBRARY_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/lib)
set(CMAKE_ARCHIVE_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/lib)

find_program(CCACHE_PROGRAM ccache)
if(CCACHE_PROGRAM AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
  set(CMAKE_CXX_COMPILER_LAUNCHER ${CCACHE_PROGRAM})
endif()

if(NOT CMAKE_BUILD_TYPE)
  set(CMAKE_BUILD_TYPE Release CACHE STRING "Release or Debug" FORCE)
endif()

# Line tables in releases, so that a crash on a box can be read.
set(CMAKE_CXX_FLAGS_RELEASE
  "-O2 -g1 -DNDEBUG -D_FORTIFY_SOURCE=2 -fstack-protector-strong")
set(ZEPHRIN_DEBUG_INFO "-g" CACHE STRING "Debug information of debug builds")
set(CMAKE_CXX_FLAGS_DEBUG "${ZEPHRIN_DEBUG_INFO} -D_GLIBCXX_ASSERTIONS")
add_link_options(-Wl,-z,relro,-z,now)

# Calls inside the shared library stay inside it, and can be inlined.
add_compile_options(-fno-semantic-interposition)

# Includes are written from the root of the repository.
include_directories(${PROJECT_SOURCE_DIR})

add_compile_options(
  -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual -Wold-style-cast
  -Wcast-align -Wunused -Wformat=2 -Wvla -Wextra-semi
  # Designated initializers leave the rest to its default on purpose.
  -Wno-missing-field-initializers)

if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  add_compile_options(
    -Wduplicated-cond -Wlogical-op -Wsuggest-override
    # g++ 12 sees these in its own std::string, std::optional and std::expected once optimized.
    -Wno-restrict -Wno-maybe-uninitialized
    # Asio's fences, which only stand beside locks that the thread sanitizer does see.
    -Wno-tsan)
endif()
