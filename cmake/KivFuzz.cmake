include_guard(GLOBAL)

# kiv_enable_fuzzing()
#
# Instruments every target declared afterwards for libFuzzer's coverage feedback, so that the
# fuzz targets under fuzz/ see into the libraries they call. Clang only. The instrumentation
# alone does nothing at run time beyond counting: the tests of the same tree build and run as
# before, which lets one sanitizer build serve both the tests and the fuzz targets.
function(kiv_enable_fuzzing)
    if(NOT CMAKE_CXX_COMPILER_ID MATCHES "Clang")
        message(FATAL_ERROR "KIV_BUILD_FUZZERS needs clang (libFuzzer); "
            "configure with CMAKE_CXX_COMPILER=clang++, as the asan preset does")
    endif()
    add_compile_options(-fsanitize=fuzzer-no-link)
    message(STATUS "kiv: coverage instrumentation for the fuzz targets enabled")
endfunction()
