# CMake toolchain file: cross-compile for 64-bit Windows with Debian's
# mingw-w64 compilers (posix threads flavour), against the dependency prefix
# built by scripts/windows/build-deps.sh.
#
# Usage:
#   prefix=$(bash scripts/windows/build-deps.sh)
#   cmake -S . -B build-windows -G Ninja \
#         -DCMAKE_TOOLCHAIN_FILE=$PWD/cmake/mingw-w64-x86_64.cmake \
#         -DDORVAN_WINDOWS_PREFIX="$prefix" -DCMAKE_BUILD_TYPE=Release
#   cmake --build build-windows
#   ctest --test-dir build-windows     # runs the .exe files under Wine
#
# The prefix may also come from the environment variable DORVAN_WINDOWS_PREFIX
# (the cache variable wins when both are set). When the prefix changes (its
# path contains a hash of the recipe), configure with `cmake --fresh` or in a
# new build folder: CMake caches where it found each package.
#
# What resolves to the prefix:
#   find_package(Poco REQUIRED COMPONENTS Foundation Net NetSSL Crypto Util)
#   find_package(OpenSSL)          -> OpenSSL 3.0 import libraries + DLLs
#   find_package(jsoncpp CONFIG)   -> target jsoncpp_lib (shared)
#   find_package(GTest)            -> GTest::gtest, GTest::gtest_main, GTest::gmock
#   find_package(Boost 1.74)       -> Boost::headers; <prefix>/include/boost is
#                                     a symbolic link to Debian's /usr/include/boost,
#                                     so /usr/include itself never reaches the
#                                     compiler and no Linux library can be found.
#                                     There are no compiled Boost libraries:
#                                     `COMPONENTS system` fails (Boost.System is
#                                     header-only since 1.69; use Boost::headers)
#   find_package(wxWidgets REQUIRED COMPONENTS base [net])
#                                  -> the prefix's wx-config (set below); its
#                                     wx/setup.h already defines wxUSE_GUI 0
#
# Run time: the prefix's bin/ holds every DLL the programs need (POCO,
# OpenSSL, wxWidgets, JsonCpp and the mingw-w64 runtime: libstdc++-6,
# libgcc_s_seh-1, libwinpthread-1). Either copy them beside the .exe files or
# put that folder on WINEPATH (see DORVAN_WINDOWS_DLL_DIR below).

set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR x86_64)
set(CMAKE_SYSTEM_VERSION 10.0)

set(_dorvan_triplet x86_64-w64-mingw32)

# --- Dependency prefix ------------------------------------------------------
# try_compile() projects re-read this file without our cache, so the value is
# also handed over through the environment and the platform variables.
if(NOT DORVAN_WINDOWS_PREFIX AND DEFINED ENV{DORVAN_WINDOWS_PREFIX})
  set(DORVAN_WINDOWS_PREFIX "$ENV{DORVAN_WINDOWS_PREFIX}")
endif()
if(NOT DORVAN_WINDOWS_PREFIX)
  message(FATAL_ERROR
    "mingw-w64-x86_64.cmake: set DORVAN_WINDOWS_PREFIX (cache variable or "
    "environment variable) to the prefix printed by scripts/windows/build-deps.sh")
endif()
if(NOT EXISTS "${DORVAN_WINDOWS_PREFIX}/.complete")
  message(FATAL_ERROR
    "mingw-w64-x86_64.cmake: ${DORVAN_WINDOWS_PREFIX} is not a complete "
    "dependency prefix (no .complete stamp); run scripts/windows/build-deps.sh")
endif()
set(DORVAN_WINDOWS_PREFIX "${DORVAN_WINDOWS_PREFIX}" CACHE PATH
    "Windows dependency prefix built by scripts/windows/build-deps.sh")
set(ENV{DORVAN_WINDOWS_PREFIX} "${DORVAN_WINDOWS_PREFIX}")
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES DORVAN_WINDOWS_PREFIX)

# Folder with all run-time DLLs (for WINEPATH or for copying beside .exe files).
set(DORVAN_WINDOWS_DLL_DIR "${DORVAN_WINDOWS_PREFIX}/bin")

# --- Compilers and binary tools ---------------------------------------------
set(CMAKE_C_COMPILER   ${_dorvan_triplet}-gcc-posix)
set(CMAKE_CXX_COMPILER ${_dorvan_triplet}-g++-posix)
set(CMAKE_RC_COMPILER  ${_dorvan_triplet}-windres)
set(CMAKE_MC_COMPILER  ${_dorvan_triplet}-windmc)
set(CMAKE_AR           ${_dorvan_triplet}-gcc-ar-posix CACHE FILEPATH "")
set(CMAKE_RANLIB       ${_dorvan_triplet}-gcc-ranlib-posix CACHE FILEPATH "")
set(PKG_CONFIG_EXECUTABLE ${_dorvan_triplet}-pkg-config CACHE FILEPATH "")

# Target Windows 10 everywhere. mingw-w64's <_mingw.h> would default to the
# same value, but Boost.Asio checks _WIN32_WINNT before any Windows header is
# included, warns and falls back to 0x0601 unless it is given on the command
# line. The prefix was built with the same value.
set(CMAKE_C_FLAGS_INIT "-D_WIN32_WINNT=0x0A00")
set(CMAKE_CXX_FLAGS_INIT "-D_WIN32_WINNT=0x0A00")

# --- Where to look ----------------------------------------------------------
# Libraries, headers and CMake packages only inside the prefix and the
# mingw-w64 sysroot; programs (wine, python, ...) only on the build machine.
set(CMAKE_FIND_ROOT_PATH "${DORVAN_WINDOWS_PREFIX}" /usr/${_dorvan_triplet})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
# Keep pkg-config (used by some Find modules) away from the Linux .pc files.
set(ENV{PKG_CONFIG_LIBDIR} "${DORVAN_WINDOWS_PREFIX}/lib/pkgconfig")
set(ENV{PKG_CONFIG_SYSROOT_DIR} "")

# OpenSSL: FindOpenSSL honours OPENSSL_ROOT_DIR; the default search would also
# work, this just makes the choice explicit.
set(OPENSSL_ROOT_DIR "${DORVAN_WINDOWS_PREFIX}")

# Boost: header-only, found through <prefix>/include/boost (a link to the
# build machine's /usr/include/boost). Never use Debian's BoostConfig.cmake,
# which would describe the Linux libraries.
set(Boost_NO_BOOST_CMAKE ON)
set(Boost_NO_SYSTEM_PATHS ON)
set(BOOST_ROOT "${DORVAN_WINDOWS_PREFIX}")

# wxWidgets: FindwxWidgets uses wx-config when cross-compiling; point it at
# the prefix's script and select the mingw-w64 build by host triplet.
set(wxWidgets_CONFIG_EXECUTABLE "${DORVAN_WINDOWS_PREFIX}/bin/wx-config"
    CACHE FILEPATH "wx-config of the Windows dependency prefix" FORCE)
set(wxWidgets_CONFIG_OPTIONS --host=${_dorvan_triplet})

# --- Running the results ----------------------------------------------------
# ctest, add_test() and try_run() start the .exe files through Wine.
find_program(DORVAN_WINE_EXECUTABLE NAMES wine wine64 NO_CMAKE_FIND_ROOT_PATH)
if(DORVAN_WINE_EXECUTABLE)
  set(CMAKE_CROSSCOMPILING_EMULATOR "${DORVAN_WINE_EXECUTABLE}")
endif()
