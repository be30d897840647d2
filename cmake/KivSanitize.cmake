include_guard(GLOBAL)

# kiv_apply_sanitizers(<list>)
#
# <list> is a comma-separated sanitizer list as accepted by -fsanitize=, for example
# "address,undefined" or "thread". The flags are added to every target declared
# afterwards in this directory and below, for both compiling and linking.
function(kiv_apply_sanitizers sanitizers)
    string(STRIP "${sanitizers}" sanitizers)
    string(REPLACE " " "" sanitizers "${sanitizers}")
    if(sanitizers STREQUAL "")
        return()
    endif()

    if(MSVC)
        message(FATAL_ERROR "KIV_SANITIZE is only supported with GCC and Clang")
    endif()

    string(REPLACE "," ";" names "${sanitizers}")
    foreach(name IN LISTS names)
        if(NOT name MATCHES "^(address|undefined|thread|leak)$")
            message(FATAL_ERROR "KIV_SANITIZE: unknown sanitizer '${name}' "
                "(expected address, undefined, thread or leak)")
        endif()
    endforeach()
    if("thread" IN_LIST names AND ("address" IN_LIST names OR "leak" IN_LIST names))
        message(FATAL_ERROR "KIV_SANITIZE: thread cannot be combined with address or leak")
    endif()

    set(flags -fsanitize=${sanitizers} -fno-omit-frame-pointer -fno-sanitize-recover=undefined)
    add_compile_options(${flags})
    add_link_options(${flags})
    message(STATUS "kiv: sanitizers enabled: ${sanitizers}")
endfunction()
