include_guard(GLOBAL)

include(CMakePackageConfigHelpers)

# kiv_install()
#
# Declares what `cmake --install <build> [--prefix DIR]` lays out for projects that build
# on kiv. Paths are GNUInstallDirs' (lib may be lib64 or lib/<multiarch> there):
#
#   include/                  the headers of qf::zero (qf/zero/..., foundation/...) and kiv
#                             (kiv/...), kiv's generated headers (kiv/metamodel/...) among them
#   lib/libqf_zero.a, lib/libkiv.a
#   lib/cmake/kiv/            kivConfig.cmake (find_package(kiv CONFIG)), its version file, the
#                             exported targets qf::zero, kiv::kiv and kiv::kiv-serve, and
#                             Qf0Generate.cmake (qf0_generate_metamodel)
#   lib/pkgconfig/kiv.pc
#   share/kiv/qf0gen/         the metamodel generator (qf0gen.py and its package)
#   bin/kiv-serve
#
# Every path written into the package is relative to the prefix, so the tree can be
# installed anywhere and moved afterwards. Call it after the targets are declared.
function(kiv_install)
    set(config_dir "${CMAKE_INSTALL_LIBDIR}/cmake/kiv")
    set(KIV_INSTALL_QF0GEN_DIR "${CMAKE_INSTALL_DATADIR}/kiv/qf0gen")

    install(DIRECTORY "${PROJECT_SOURCE_DIR}/zero/include/" "${PROJECT_SOURCE_DIR}/kiv/include/"
        DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}"
        FILES_MATCHING PATTERN "*.h")
    # Public headers include the generated ones, internal/ included, so all of them go.
    get_target_property(kiv_binary_dir kiv BINARY_DIR)
    install(DIRECTORY "${kiv_binary_dir}/generated/include/"
        DESTINATION "${CMAKE_INSTALL_INCLUDEDIR}"
        FILES_MATCHING PATTERN "*.h")

    # Two export sets, because the two libraries live in namespaces of their own.
    install(TARGETS qf_zero EXPORT qfZeroTargets
        ARCHIVE DESTINATION "${CMAKE_INSTALL_LIBDIR}")
    install(TARGETS kiv kiv-serve EXPORT kivTargets
        ARCHIVE DESTINATION "${CMAKE_INSTALL_LIBDIR}"
        RUNTIME DESTINATION "${CMAKE_INSTALL_BINDIR}")
    install(EXPORT qfZeroTargets NAMESPACE qf:: DESTINATION "${config_dir}")
    install(EXPORT kivTargets NAMESPACE kiv:: DESTINATION "${config_dir}")

    # The generator runs from where it is installed; Qf0Generate.cmake finds it there
    # through KIV_QF0GEN_DIR, which the package configuration sets.
    install(PROGRAMS "${PROJECT_SOURCE_DIR}/tools/qf0gen/qf0gen.py"
        DESTINATION "${KIV_INSTALL_QF0GEN_DIR}")
    install(DIRECTORY "${PROJECT_SOURCE_DIR}/tools/qf0gen/qf0gen"
        DESTINATION "${KIV_INSTALL_QF0GEN_DIR}"
        FILES_MATCHING PATTERN "*.py"
        PATTERN "__pycache__" EXCLUDE)

    configure_package_config_file("${PROJECT_SOURCE_DIR}/cmake/kivConfig.cmake.in"
        "${PROJECT_BINARY_DIR}/package/kivConfig.cmake"
        INSTALL_DESTINATION "${config_dir}"
        PATH_VARS KIV_INSTALL_QF0GEN_DIR)
    # 0.x: a minor release may break the API, so only the same minor version will do.
    write_basic_package_version_file("${PROJECT_BINARY_DIR}/package/kivConfigVersion.cmake"
        VERSION "${PROJECT_VERSION}"
        COMPATIBILITY SameMinorVersion)
    install(FILES
            "${PROJECT_BINARY_DIR}/package/kivConfig.cmake"
            "${PROJECT_BINARY_DIR}/package/kivConfigVersion.cmake"
            "${PROJECT_SOURCE_DIR}/cmake/Qf0Generate.cmake"
        DESTINATION "${config_dir}")

    # kiv.pc names its directories from its own place (${pcfiledir}), so it stays right
    # under whatever prefix the tree is installed to.
    set(pc_dir "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
    if(IS_ABSOLUTE "${pc_dir}")
        set(KIV_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
    else()
        file(RELATIVE_PATH up "/root/${pc_dir}" "/root")
        set(KIV_PC_PREFIX "\${pcfiledir}/${up}")
        string(REGEX REPLACE "/$" "" KIV_PC_PREFIX "${KIV_PC_PREFIX}")
    endif()
    foreach(kind IN ITEMS LIBDIR INCLUDEDIR)
        if(IS_ABSOLUTE "${CMAKE_INSTALL_${kind}}")
            set(KIV_PC_${kind} "${CMAKE_INSTALL_${kind}}")
        else()
            set(KIV_PC_${kind} "\${prefix}/${CMAKE_INSTALL_${kind}}")
        endif()
    endforeach()
    configure_file("${PROJECT_SOURCE_DIR}/cmake/kiv.pc.in" "${PROJECT_BINARY_DIR}/package/kiv.pc" @ONLY)
    install(FILES "${PROJECT_BINARY_DIR}/package/kiv.pc" DESTINATION "${pc_dir}")
endfunction()
