include_guard(GLOBAL)

# qf0_generate_metamodel(<out-sources-var> <description.json> <output-dir>)
#
# Runs the metamodel generator (tools/qf0gen) on a JSON description and returns the
# generated C++ sources in <out-sources-var>. Headers land in <output-dir>/include,
# which the caller adds to its target's include directories. The generator reruns
# when the description or the generator changes; files whose text is unchanged keep
# their time stamps, so nothing that includes them is rebuilt.
#
# The same file serves kiv's source tree and an installed kiv: in the source tree the
# generator is tools/qf0gen beside this file's folder; an installed kiv's package
# configuration (find_package(kiv CONFIG)) sets KIV_QF0GEN_DIR to the installed generator
# before including this file.
find_package(Python3 3.8 REQUIRED COMPONENTS Interpreter)
# The guard runs this once, in the first directory that includes it, and
# find_package's results are variables of that directory; the function is called from
# other directories too, so it reads the interpreter from the cache.
set(QF0GEN_PYTHON "${Python3_EXECUTABLE}" CACHE INTERNAL "")
if(DEFINED KIV_QF0GEN_DIR)
    set(QF0GEN_DIR "${KIV_QF0GEN_DIR}" CACHE INTERNAL "")
else()
    set(QF0GEN_DIR "${CMAKE_CURRENT_LIST_DIR}/../tools/qf0gen" CACHE INTERNAL "")
endif()
if(NOT EXISTS "${QF0GEN_DIR}/qf0gen.py")
    message(FATAL_ERROR "Qf0Generate: the metamodel generator is not at ${QF0GEN_DIR}/qf0gen.py")
endif()

function(qf0_generate_metamodel out_var description out_dir)
    get_filename_component(description "${description}" ABSOLUTE)
    execute_process(
        COMMAND "${QF0GEN_PYTHON}" "${QF0GEN_DIR}/qf0gen.py" "${description}" --list
        OUTPUT_VARIABLE listing
        ERROR_VARIABLE errors
        RESULT_VARIABLE result)
    if(NOT result EQUAL 0)
        message(FATAL_ERROR "${errors}")
    endif()
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS "${description}")

    string(STRIP "${listing}" listing)
    string(REPLACE "\n" ";" relative_paths "${listing}")
    set(outputs "")
    set(sources "")
    foreach(path IN LISTS relative_paths)
        list(APPEND outputs "${out_dir}/${path}")
        if(path MATCHES "\\.cpp$")
            list(APPEND sources "${out_dir}/${path}")
        endif()
    endforeach()

    file(GLOB generator_files CONFIGURE_DEPENDS "${QF0GEN_DIR}/*.py" "${QF0GEN_DIR}/qf0gen/*.py")
    get_filename_component(name "${description}" NAME_WE)
    set(stamp "${out_dir}/${name}.stamp")
    add_custom_command(
        OUTPUT "${stamp}"
        BYPRODUCTS ${outputs}
        COMMAND "${QF0GEN_PYTHON}" "${QF0GEN_DIR}/qf0gen.py" "${description}" --out "${out_dir}"
        COMMAND "${CMAKE_COMMAND}" -E touch "${stamp}"
        DEPENDS "${description}" ${generator_files}
        COMMENT "Generating the classes of ${name}"
        VERBATIM)
    set(${out_var} "${sources};${stamp}" PARENT_SCOPE)
endfunction()
