# SPDX-License-Identifier: Apache-2.0
# The libraries that the project calls. packaging/debian-packages.txt names the packages they are in.

find_package(Threads REQUIRED)
find_package(PkgConfig REQUIRED)
find_package(ICU REQUIRED COMPONENTS uc)
find_package(simdjson REQUIRED)
pkg_check_modules(libdeflate REQUIRED IMPORTED_TARGET libdeflate)
find_package(EXPAT REQUIRED)
find_package(OpenSSL REQUIRED COMPONENTS Crypto)
find_package(CLI11 REQUIRED)
pkg_check_modules(libnats REQUIRED IMPORTED_TARGET libnats)
find_package(spdlog REQUIRED)
pkg_check_modules(libmicrohttpd REQUIRED IMPORTED_TARGET libmicrohttpd)

# The real bundle framework is used where it is installed; framework/ stands in for it elsewhere.
find_package(CppMicroServices 3.8 CONFIG QUIET)

if(BUILD_TESTING)
  find_package(GTest REQUIRED)
  include(GoogleTest)
endif()
