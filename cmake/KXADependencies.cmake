# Libraries the kxacore target links. Shared by the build and by the
# installed package config, so a consumer of the static library finds the
# same imported targets.
find_package(PkgConfig REQUIRED)
find_package(Threads REQUIRED)
find_package(ICU REQUIRED COMPONENTS uc i18n data)
find_package(nlohmann_json REQUIRED)
pkg_check_modules(PCRE2 REQUIRED IMPORTED_TARGET GLOBAL libpcre2-8)
pkg_check_modules(PLIST REQUIRED IMPORTED_TARGET GLOBAL libplist-2.0)
find_package(ZLIB REQUIRED)
find_package(OpenSSL REQUIRED COMPONENTS Crypto)
find_package(hwy REQUIRED)
pkg_check_modules(MINIZIP REQUIRED IMPORTED_TARGET GLOBAL minizip)
# minizip's own folder would make <zip.h> minizip's even where libzip's is
# meant: the library always writes <minizip/zip.h>.
set_property(TARGET PkgConfig::MINIZIP PROPERTY INTERFACE_INCLUDE_DIRECTORIES "")
pkg_check_modules(LIBZIP REQUIRED IMPORTED_TARGET GLOBAL libzip)
pkg_check_modules(CAIRO REQUIRED IMPORTED_TARGET GLOBAL cairo)
pkg_check_modules(VIPS REQUIRED IMPORTED_TARGET GLOBAL vips-cpp)
# Standalone Asio is header-only and ships no CMake or pkg-config file.
find_path(ASIO_INCLUDE_DIR asio.hpp REQUIRED)
if(NOT TARGET kxa_asio)
  add_library(kxa_asio INTERFACE IMPORTED)
  target_include_directories(kxa_asio INTERFACE ${ASIO_INCLUDE_DIR})
  target_compile_definitions(kxa_asio INTERFACE ASIO_STANDALONE ASIO_NO_DEPRECATED)
  target_link_libraries(kxa_asio INTERFACE Threads::Threads)
endif()
