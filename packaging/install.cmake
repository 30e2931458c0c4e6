# SPDX-License-Identifier: Apache-2.0
# What is installed; debian/ distributes it over packages.

include(CMakePackageConfigHelpers)

# What is written below names the prefix, so it counts from the root even where it was given from here.
install(CODE "get_filename_component(CMAKE_INSTALL_PREFIX \"\${CMAKE_INSTALL_PREFIX}\" ABSOLUTE)")

set_property(TARGET kspplatform PROPERTY EXPORT_NAME platform)
install(TARGETS ksp kspplatform EXPORT kspTargets)
install(TARGETS brellium RUNTIME DESTINATION ${CMAKE_INSTALL_SBINDIR})
install(TARGETS kspdump RUNTIME)

set(cmake_package ${CMAKE_INSTALL_LIBDIR}/cmake/ksp)
install(DIRECTORY include/ksp DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
file(GLOB platform_headers platform/*.h)
install(FILES ${platform_headers} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/ksp/platform)
install(EXPORT kspTargets NAMESPACE ksp:: DESTINATION ${cmake_package})
configure_package_config_file(packaging/kspConfig.cmake.in generated/kspConfig.cmake
                              INSTALL_DESTINATION ${cmake_package})
write_basic_package_version_file(generated/kspConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/kspConfig.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/generated/kspConfigVersion.cmake
        DESTINATION ${cmake_package})

# The prefix may be another at the time of the installation than it was when the build was configured.
install(CODE "
  set(CMAKE_INSTALL_LIBDIR \"${CMAKE_INSTALL_LIBDIR}\")
  set(CMAKE_INSTALL_INCLUDEDIR \"${CMAKE_INSTALL_INCLUDEDIR}\")
  set(PROJECT_VERSION \"${PROJECT_VERSION}\")
  configure_file(\"${PROJECT_SOURCE_DIR}/packaging/ksp.pc.in\" \"${CMAKE_CURRENT_BINARY_DIR}/generated/ksp.pc\" @ONLY)
  ")
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/ksp.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
install(CODE "
  set(CMAKE_INSTALL_FULL_SBINDIR \"\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_SBINDIR}\")
  configure_file(\"${PROJECT_SOURCE_DIR}/packaging/brellium.service.in\"
                 \"${CMAKE_CURRENT_BINARY_DIR}/generated/brellium.service\" @ONLY)
  ")
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/brellium.service DESTINATION lib/systemd/system)

install(FILES docs/man/brellium.8 DESTINATION ${CMAKE_INSTALL_MANDIR}/man8)
install(FILES docs/man/ksp-host.toml.5 DESTINATION ${CMAKE_INSTALL_MANDIR}/man5)
install(FILES docs/man/kspdump.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
install(FILES docs/man/libksp.3 DESTINATION ${CMAKE_INSTALL_MANDIR}/man3)
install(FILES packaging/kspdump.bash-completion DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions
        RENAME kspdump)

# Documents and examples lie under what they belong to, which is how the packages are called.
set(documents ${CMAKE_INSTALL_DATADIR}/doc)
install(DIRECTORY examples/hosts DESTINATION ${documents}/brellium/examples)
install(FILES docs/formats.md docs/fleet.md DESTINATION ${documents}/kspdump)
install(DIRECTORY examples/captures DESTINATION ${documents}/kspdump/examples
        PATTERN generate.cpp EXCLUDE)
install(DIRECTORY examples/cluster examples/monitoring DESTINATION ${documents}/kspdump/examples
        USE_SOURCE_PERMISSIONS PATTERN __pycache__ EXCLUDE)
install(DIRECTORY examples/client DESTINATION ${documents}/libksp-dev/examples)
install(FILES platform/README.md DESTINATION ${documents}/libksp-dev RENAME porting.md)
