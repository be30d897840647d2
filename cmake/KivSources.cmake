include_guard(GLOBAL)

# kiv_glob_sources(<out-var> <name> <dir>)
#
# Collects every *.cpp below <dir> (re-globbed at build time, so adding a file needs
# no CMake edit). When <dir> holds no source yet, a generated empty translation unit
# is returned instead so that a real library target can still be declared and
# linked against.
function(kiv_glob_sources out_var name dir)
    file(GLOB_RECURSE sources CONFIGURE_DEPENDS "${dir}/*.cpp")
    list(SORT sources)
    if(NOT sources)
        set(placeholder "${CMAKE_CURRENT_BINARY_DIR}/${name}_placeholder.cpp")
        file(CONFIGURE OUTPUT "${placeholder}"
            CONTENT "// Generated: ${name} has no sources yet.\n")
        set(sources "${placeholder}")
        message(STATUS "kiv: ${name} has no sources under ${dir}, using an empty placeholder")
    endif()
    set(${out_var} "${sources}" PARENT_SCOPE)
endfunction()
