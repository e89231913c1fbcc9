# Install step (Windows): copies into DORVAN_NEBI_BIN_DIR every DLL that the
# executables and DLLs already there import, directly or through one another,
# and that DORVAN_NEBI_DLL_SOURCE holds. Imports found in neither place must
# be Windows' own DLLs; any other is an error, so that an install tree never
# silently lacks a DLL.
#
# Inputs: DORVAN_NEBI_OBJDUMP, DORVAN_NEBI_DLL_SOURCE, DORVAN_NEBI_BIN_DIR.

# Install scripts run without the project's policies.
cmake_policy(PUSH)
cmake_policy(VERSION 3.20)

# DLLs that every Windows installation has (or, for the api-ms-win-* names,
# that Windows resolves itself).
set(_system_dlls
    advapi32.dll bcrypt.dll comctl32.dll comdlg32.dll crypt32.dll dbghelp.dll gdi32.dll
    iphlpapi.dll kernel32.dll mpr.dll msvcrt.dll mswsock.dll netapi32.dll ntdll.dll ole32.dll
    oleaut32.dll psapi.dll rpcrt4.dll secur32.dll shell32.dll shlwapi.dll user32.dll
    userenv.dll uuid.dll version.dll winhttp.dll winmm.dll winspool.drv ws2_32.dll wsock32.dll)

function(_dorvan_nebi_imports binary out)
    execute_process(COMMAND "${DORVAN_NEBI_OBJDUMP}" -p "${binary}"
        OUTPUT_VARIABLE _dump RESULT_VARIABLE _rc ERROR_QUIET)
    if(NOT _rc EQUAL 0)
        message(FATAL_ERROR "objdump cannot read ${binary}")
    endif()
    string(REGEX MATCHALL "DLL Name: [^\r\n]+" _lines "${_dump}")
    set(_names "")
    foreach(_line IN LISTS _lines)
        string(REGEX REPLACE "^DLL Name: *" "" _name "${_line}")
        string(STRIP "${_name}" _name)
        list(APPEND _names "${_name}")
    endforeach()
    set(${out} "${_names}" PARENT_SCOPE)
endfunction()

file(GLOB _pending "${DORVAN_NEBI_BIN_DIR}/*.exe" "${DORVAN_NEBI_BIN_DIR}/*.dll")
set(_seen "")
while(_pending)
    list(POP_FRONT _pending _binary)
    _dorvan_nebi_imports("${_binary}" _imports)
    foreach(_import IN LISTS _imports)
        string(TOLOWER "${_import}" _lower)
        if(_lower IN_LIST _seen OR _lower IN_LIST _system_dlls OR _lower MATCHES "^(api|ext)-ms-win-")
            continue()
        endif()
        list(APPEND _seen "${_lower}")
        if(EXISTS "${DORVAN_NEBI_BIN_DIR}/${_import}")
            # One of ours (or copied before): follow its imports as well.
            list(APPEND _pending "${DORVAN_NEBI_BIN_DIR}/${_import}")
        elseif(EXISTS "${DORVAN_NEBI_DLL_SOURCE}/${_import}")
            file(INSTALL DESTINATION "${DORVAN_NEBI_BIN_DIR}" TYPE SHARED_LIBRARY
                FILES "${DORVAN_NEBI_DLL_SOURCE}/${_import}")
            list(APPEND _pending "${DORVAN_NEBI_BIN_DIR}/${_import}")
        else()
            message(FATAL_ERROR "${_binary} imports ${_import}, which is neither a Windows DLL "
                                "nor in ${DORVAN_NEBI_DLL_SOURCE}")
        endif()
    endforeach()
endwhile()

cmake_policy(POP)
