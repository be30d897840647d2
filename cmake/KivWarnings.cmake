include_guard(GLOBAL)

# kiv_set_warnings(<target>)
#
# Turns on the project's warning set for <target>. Warnings become errors only
# when KIV_WERROR is ON, so a newer compiler never breaks a plain build.
function(kiv_set_warnings target)
    if(MSVC)
        target_compile_options(${target} PRIVATE /W4 /permissive-)
        if(KIV_WERROR)
            target_compile_options(${target} PRIVATE /WX)
        endif()
    else()
        target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic)
        if(KIV_WERROR)
            target_compile_options(${target} PRIVATE -Werror)
        endif()
    endif()
endfunction()
