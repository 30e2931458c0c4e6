# What is installed, and the Debian packages that carry it.

include(CMakePackageConfigHelpers)

set_property(TARGET kspplatform PROPERTY EXPORT_NAME platform)
install(TARGETS ksp kspplatform EXPORT kspTargets
        LIBRARY COMPONENT libksp NAMELINK_COMPONENT libksp-dev)
install(TARGETS brellium RUNTIME DESTINATION ${CMAKE_INSTALL_SBINDIR} COMPONENT brellium)
install(TARGETS kspdump RUNTIME COMPONENT kspdump)

set(cmake_package ${CMAKE_INSTALL_LIBDIR}/cmake/ksp)
install(DIRECTORY include/ksp DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} COMPONENT libksp-dev)
file(GLOB platform_headers platform/*.h)
install(FILES ${platform_headers} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/ksp/platform COMPONENT libksp-dev)
install(EXPORT kspTargets NAMESPACE ksp:: DESTINATION ${cmake_package} COMPONENT libksp-dev)
configure_package_config_file(packaging/kspConfig.cmake.in generated/kspConfig.cmake
                              INSTALL_DESTINATION ${cmake_package})
write_basic_package_version_file(generated/kspConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/kspConfig.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/generated/kspConfigVersion.cmake
        DESTINATION ${cmake_package} COMPONENT libksp-dev)

# The prefix may be another at the time of the installation than it was when the build was configured.
install(CODE "
  set(CMAKE_INSTALL_LIBDIR \"${CMAKE_INSTALL_LIBDIR}\")
  set(CMAKE_INSTALL_INCLUDEDIR \"${CMAKE_INSTALL_INCLUDEDIR}\")
  set(PROJECT_VERSION \"${PROJECT_VERSION}\")
  configure_file(\"${PROJECT_SOURCE_DIR}/packaging/ksp.pc.in\" \"${CMAKE_CURRENT_BINARY_DIR}/generated/ksp.pc\" @ONLY)
  " COMPONENT libksp-dev)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/ksp.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig
        COMPONENT libksp-dev)
install(CODE "
  set(CMAKE_INSTALL_FULL_SBINDIR \"\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_SBINDIR}\")
  configure_file(\"${PROJECT_SOURCE_DIR}/packaging/brellium.service.in\"
                 \"${CMAKE_CURRENT_BINARY_DIR}/generated/brellium.service\" @ONLY)
  " COMPONENT brellium)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/generated/brellium.service DESTINATION lib/systemd/system
        COMPONENT brellium)

install(FILES docs/man/brellium.8 DESTINATION ${CMAKE_INSTALL_MANDIR}/man8 COMPONENT brellium)
install(FILES docs/man/ksp-host.toml.5 DESTINATION ${CMAKE_INSTALL_MANDIR}/man5 COMPONENT brellium)
install(FILES docs/man/kspdump.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT kspdump)
install(FILES docs/man/libksp.3 DESTINATION ${CMAKE_INSTALL_MANDIR}/man3 COMPONENT libksp-dev)
install(DIRECTORY examples/hosts DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples COMPONENT brellium)
install(FILES docs/formats.md docs/fleet.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT kspdump)
install(DIRECTORY examples/cluster DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples COMPONENT kspdump
        USE_SOURCE_PERMISSIONS PATTERN __pycache__ EXCLUDE)
install(FILES packaging/kspdump.bash-completion DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions
        RENAME kspdump COMPONENT kspdump)

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_CONTACT "The brellium maintainers <brellium@localhost>")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
# Each package has a description of its own, without the project's in front.
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "")
set(CPACK_COMPONENTS_ALL brellium libksp libksp-dev kspdump)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${CMAKE_LIBRARY_OUTPUT_DIRECTORY})
set(CPACK_DEBIAN_ENABLE_COMPONENT_DEPENDS ON)
set(CPACK_DEBIAN_BRELLIUM_PACKAGE_NAME brellium)
set(CPACK_DEBIAN_BRELLIUM_PACKAGE_SECTION admin)
set(CPACK_DEBIAN_LIBKSP_PACKAGE_NAME libksp)
set(CPACK_DEBIAN_LIBKSP_PACKAGE_SECTION libs)
# A look into the libraries would also give the package maintainer scripts that call ldconfig, and what has a
# script leaves a trace; the trigger does the same without one.
set(CPACK_DEBIAN_LIBKSP_PACKAGE_SHLIBDEPS OFF)
set(CPACK_DEBIAN_LIBKSP_PACKAGE_DEPENDS "libc6 (>= 2.34), libgcc-s1 (>= 3.0), libstdc++6 (>= 10.2)")
set(CPACK_DEBIAN_LIBKSP_PACKAGE_CONTROL_EXTRA ${PROJECT_SOURCE_DIR}/packaging/triggers
                                              ${PROJECT_SOURCE_DIR}/packaging/shlibs)
set(CPACK_DEBIAN_LIBKSP-DEV_PACKAGE_NAME libksp-dev)
set(CPACK_DEBIAN_LIBKSP-DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_KSPDUMP_PACKAGE_NAME kspdump)
set(CPACK_DEBIAN_KSPDUMP_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_BRELLIUM_DESCRIPTION "daemon that drives a flash storage controller's background work")
set(CPACK_DEBIAN_LIBKSP_DESCRIPTION "library that decodes the exports of a flash storage controller")
set(CPACK_DEBIAN_LIBKSP-DEV_DESCRIPTION "headers and build files of libksp")
set(CPACK_DEBIAN_KSPDUMP_DESCRIPTION "decodes captures of a flash storage controller's exports")
include(CPack)
cpack_add_component(libksp)
cpack_add_component(libksp-dev DEPENDS libksp)
cpack_add_component(brellium DEPENDS libksp)
cpack_add_component(kspdump)
