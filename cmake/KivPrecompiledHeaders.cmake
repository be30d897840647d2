include_guard(GLOBAL)

# kiv_precompile_headers(<target> <header set>)
#
# Precompiles the heavy third-party and framework headers that nearly every source of the
# target includes, so that each translation unit stops parsing them again. The header set is
# one of
#   framework  the standard library, nlohmann JSON and Boost (uuid, date_time): for qf_zero;
#   library    the framework set plus the framework's core headers: for kiv;
#   tests      the library set plus GoogleTest and GoogleMock: for the test executables.
# The headers are force-included, which changes no meaning: each is self-contained and
# include-guarded. Configure with CMAKE_DISABLE_PRECOMPILE_HEADERS=ON to build without.
function(kiv_precompile_headers target header_set)
    set(framework_headers
        <algorithm> <atomic> <cstdint> <functional> <map> <memory> <mutex> <optional>
        <set> <string> <unordered_map> <unordered_set> <utility> <variant> <vector>
        <boost/date_time/posix_time/posix_time.hpp>
        <boost/uuid/uuid.hpp>
        <nlohmann/json.hpp>)
    set(library_headers ${framework_headers}
        <qf/zero/core/messages.h>
        <qf/zero/core/model_impl.h>
        <qf/zero/core/report_exception.h>
        <qf/zero/core/transaction.h>)
    if(header_set STREQUAL "framework")
        set(headers ${framework_headers})
    elseif(header_set STREQUAL "library")
        set(headers ${library_headers})
    elseif(header_set STREQUAL "tests")
        set(headers ${library_headers} <gtest/gtest.h> <gmock/gmock.h>)
    else()
        message(FATAL_ERROR "kiv_precompile_headers: unknown header set '${header_set}'")
    endif()
    target_precompile_headers(${target} PRIVATE ${headers})
endfunction()
