# Warnings and sanitizers for the project's own targets.
# Third-party headers come in through imported targets and are therefore
# system headers: their warnings do not count against ours.

function(dorvan_nebi_target_options target)
    target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic)
    if(DORVAN_NEBI_WERROR)
        target_compile_options(${target} PRIVATE -Werror)
    endif()
endfunction()

# The project's shared libraries. On Windows they are DLLs named as Windows
# names them (DorvanNebiConnector.dll, not libDorvanNebiConnector.dll); their
# import libraries keep the lib prefix that MinGW linkers look for.
function(dorvan_nebi_shared_library_options target)
    if(WIN32)
        set_target_properties(${target} PROPERTIES PREFIX "")
    endif()
endfunction()

if(DORVAN_NEBI_SANITIZER STREQUAL "address")
    set(_flags -fsanitize=address,undefined -fno-sanitize-recover=undefined -fno-omit-frame-pointer)
elseif(DORVAN_NEBI_SANITIZER STREQUAL "thread")
    # -Wno-tsan: Boost.Asio's fenced blocks use atomic_thread_fence, which
    # ThreadSanitizer does not model; GCC warns about every use.
    set(_flags -fsanitize=thread -fno-omit-frame-pointer -Wno-tsan)
elseif(NOT DORVAN_NEBI_SANITIZER STREQUAL "")
    message(FATAL_ERROR "DORVAN_NEBI_SANITIZER must be empty, 'address' or 'thread'")
endif()
if(_flags)
    # The sanitizers' instrumentation makes GCC see uninitialised values in
    # the standard library where there are none.
    list(APPEND _flags -Wno-maybe-uninitialized)
    add_compile_options(${_flags})
    add_link_options(${_flags})
endif()
