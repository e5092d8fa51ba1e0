# The libraries that the project stands on. Targets that this file defines:
#   asio              standalone Asio, without its deprecated parts; platform/ipc compiles it
#   sdt               sys/sdt.h, static probes
#   seccomp           libseccomp
#   systemd_optional  libsystemd, with HAVE_LIBSYSTEMD=1 where it is there; else empty
# Imported ones: Threads::Threads EXPAT::EXPAT SQLite::SQLite3 OpenSSL::Crypto CLI11::CLI11
# nlohmann_json::nlohmann_json GTest::gmock_main

find_package(Threads REQUIRED)
find_package(EXPAT REQUIRED)
find_package(SQLite3 REQUIRED)
find_package(OpenSSL 3 REQUIRED COMPONENTS Crypto)
find_package(CLI11 REQUIRED)
find_package(nlohmann_json REQUIRED)
find_package(PkgConfig REQUIRED)

find_path(ASIO_INCLUDE_DIR asio.hpp REQUIRED)
add_library(asio INTERFACE)
target_include_directories(asio SYSTEM INTERFACE ${ASIO_INCLUDE_DIR})
# Asio's own test for aligned_alloc depends on what was included before it, so that sources could
# disagree on who frees; without it all use operator new.
target_compile_definitions(asio INTERFACE
  ASIO_STANDALONE ASIO_NO_DEPRECATED ASIO_SEPARATE_COMPILATION ASIO_DISABLE_STD_ALIGNED_ALLOC)
target_link_libraries(asio INTERFACE Threads::Threads)

find_path(SDT_INCLUDE_DIR sys/sdt.h REQUIRED)
add_library(sdt INTERFACE)
target_include_directories(sdt SYSTEM INTERFACE ${SDT_INCLUDE_DIR})

pkg_check_modules(LIBSECCOMP REQUIRED IMPORTED_TARGET libseccomp)
add_library(seccomp INTERFACE)
target_link_libraries(seccomp INTERFACE PkgConfig::LIBSECCOMP)

add_library(systemd_optional INTERFACE)
pkg_check_modules(LIBSYSTEMD QUIET IMPORTED_TARGET libsystemd)
if(LIBSYSTEMD_FOUND)
  target_link_libraries(systemd_optional INTERFACE PkgConfig::LIBSYSTEMD)
  target_compile_definitions(systemd_optional INTERFACE HAVE_LIBSYSTEMD=1)
else()
  message(STATUS "libsystemd not found: built without the journal and readiness")
endif()

if(ZEPHRIN_TESTS)
  find_package(GTest QUIET)
  if(NOT GTest_FOUND)
    message(STATUS "GoogleTest not found: the tests are left out")
  endif()
endif()
