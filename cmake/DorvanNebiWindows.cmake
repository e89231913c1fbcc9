# Windows: what the DLLs and programs need at run time, in the build tree and
# in the install tree. Included by the top-level CMakeLists.txt when the
# target is Windows.
#
# DORVAN_WINDOWS_DLL_DIR (set by cmake/mingw-w64-x86_64.cmake) is the folder
# holding every dependency DLL: POCO, OpenSSL, wxWidgets, JsonCpp and the
# compiler's runtime (libstdc++-6, libgcc_s_seh-1, libwinpthread-1).
#
# Build tree: those DLLs are copied into bin/ beside the project's DLLs and
# programs, so that tests and tools start without any search path.
#
# Install tree: bin/ receives the DLLs that the project's installed DLLs and
# programs import, directly or through one another (found with objdump when
# installing), so that the tree runs on a machine that has nothing else.

if(NOT DORVAN_WINDOWS_DLL_DIR)
    message(STATUS "DORVAN_WINDOWS_DLL_DIR is not set: the dependency DLLs are not copied "
                   "into the build tree nor installed")
    return()
endif()

file(GLOB DORVAN_NEBI_DEPENDENCY_DLLS "${DORVAN_WINDOWS_DLL_DIR}/*.dll")
if(NOT DORVAN_NEBI_DEPENDENCY_DLLS)
    message(FATAL_ERROR "no DLL in DORVAN_WINDOWS_DLL_DIR (${DORVAN_WINDOWS_DLL_DIR})")
endif()
file(COPY ${DORVAN_NEBI_DEPENDENCY_DLLS} DESTINATION "${CMAKE_RUNTIME_OUTPUT_DIRECTORY}")

find_program(DORVAN_NEBI_OBJDUMP NAMES ${CMAKE_CXX_COMPILER_TARGET}-objdump x86_64-w64-mingw32-objdump objdump
    HINTS "${CMAKE_FIND_ROOT_PATH}/bin" NO_CMAKE_FIND_ROOT_PATH)
if(CMAKE_OBJDUMP AND CMAKE_OBJDUMP MATCHES "mingw")
    set(DORVAN_NEBI_OBJDUMP "${CMAKE_OBJDUMP}")
endif()
if(NOT DORVAN_NEBI_OBJDUMP)
    message(FATAL_ERROR "no objdump for Windows binaries found: the installed DLLs' imports cannot be followed")
endif()

# Runs last among the install steps of the top-level directory, after every
# install(TARGETS) of the subdirectories (their install code comes first).
function(dorvan_nebi_install_runtime_dlls)
    install(CODE "
        set(DORVAN_NEBI_OBJDUMP \"${DORVAN_NEBI_OBJDUMP}\")
        set(DORVAN_NEBI_DLL_SOURCE \"${DORVAN_WINDOWS_DLL_DIR}\")
        set(DORVAN_NEBI_BIN_DIR \"\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR}\")
        include(\"${PROJECT_SOURCE_DIR}/cmake/DorvanNebiInstallRuntimeDlls.cmake\")
    ")
endfunction()
