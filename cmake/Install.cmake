# `cmake --install`, in four components: Runtime (the library), Development (headers, files for CMake
# and pkg-config), Examples (sources) and Tools (orvadr; see tools/orvadr). The installed tree may be moved.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/OrvaDRCore)

install(TARGETS orvadrcore EXPORT OrvaDRCoreTargets
    LIBRARY
        DESTINATION ${CMAKE_INSTALL_LIBDIR}
        COMPONENT Runtime
        NAMELINK_COMPONENT Development
    INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
# Creates the lock directory at boot. systemd-tmpfiles reads this below /usr and /usr/local.
install(FILES cmake/orvadrcore.tmpfiles.conf
    DESTINATION lib/tmpfiles.d
    RENAME orvadrcore.conf
    COMPONENT Runtime)
install(DIRECTORY include/orvadrcore
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
    COMPONENT Development)

install(EXPORT OrvaDRCoreTargets
    NAMESPACE OrvaDRCore::
    DESTINATION ${package_dir}
    COMPONENT Development)
configure_package_config_file(cmake/OrvaDRCoreConfig.cmake.in OrvaDRCoreConfig.cmake
    INSTALL_DESTINATION ${package_dir}
    NO_SET_AND_CHECK_MACRO)
write_basic_package_version_file(OrvaDRCoreConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(FILES
    ${CMAKE_CURRENT_BINARY_DIR}/OrvaDRCoreConfig.cmake
    ${CMAKE_CURRENT_BINARY_DIR}/OrvaDRCoreConfigVersion.cmake
    DESTINATION ${package_dir}
    COMPONENT Development)

# The prefix is relative to the file, as in the CMake package.
file(RELATIVE_PATH prefix_from_pc
    ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig ${CMAKE_INSTALL_PREFIX})
configure_file(cmake/orvadrcore.pc.in orvadrcore.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/orvadrcore.pc
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig
    COMPONENT Development)

install(FILES README.md CHANGELOG.md
    DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/liborvadrcore-dev
    COMPONENT Development)
install(DIRECTORY docs
    DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/liborvadrcore-dev
    COMPONENT Development
    FILES_MATCHING PATTERN *.md PATTERN *.svg PATTERN *.json)
install(DIRECTORY examples
    DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/liborvadrcore-examples
    COMPONENT Examples
    PATTERN tests EXCLUDE)
