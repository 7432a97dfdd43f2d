# Debian packages, one per component of the installation. `cpack -G DEB` builds them; the prefix must
# be /usr.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME orvadrcore)
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "")  # each package has its own
set(CPACK_PACKAGE_CONTACT "OrvaDRCore maintainers <maintainers@orvadrcore.invalid>")
set(CPACK_PACKAGE_DIRECTORY ${PROJECT_BINARY_DIR}/packages)
set(CPACK_COMPONENTS_ALL Runtime Development Examples)
if(TARGET orvadr)
    list(APPEND CPACK_COMPONENTS_ALL Tools)
endif()
set(CPACK_STRIP_FILES ON)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)

set(about "The common services of a storage appliance's disaster recovery programs: an
object layer over SQLite, JSON and key=value files, lock files and a cache that
processes share, and the envelope of the web API.")

# orvadr_debian_package(COMPONENT NAME SECTION MULTI-ARCH SUMMARY DESCRIPTION). CPack supports the field
# Multi-Arch only since CMake 3.31, so it is appended to the section.
macro(orvadr_debian_package component name section multi_arch summary description)
    string(TOUPPER ${component} upper)
    set(CPACK_DEBIAN_${upper}_PACKAGE_NAME ${name})
    set(CPACK_DEBIAN_${upper}_PACKAGE_SECTION "${section}\nMulti-Arch: ${multi_arch}")
    set(CPACK_DEBIAN_${upper}_DESCRIPTION "${summary}\n${about}\n\n${description}")
    install(FILES cmake/debian/copyright
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${name} COMPONENT ${component})
    install(FILES ${PROJECT_BINARY_DIR}/changelog.gz
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${name} COMPONENT ${component})
endmacro()

orvadr_debian_package(Runtime liborvadrcore${PROJECT_VERSION_MAJOR} libs same
    "common services of disaster recovery programs"
    "This package holds the shared library.")
orvadr_debian_package(Development liborvadrcore-dev libdevel same
    "common services of disaster recovery programs - development"
    "This package holds the headers, what CMake and pkg-config need, and the guide.")
orvadr_debian_package(Examples liborvadrcore-examples doc foreign
    "common services of disaster recovery programs - examples"
    "This package holds programs that use the library, to read and to build.")
if(TARGET orvadr)
    orvadr_debian_package(Tools orvadr-tools admin foreign
        "common services of disaster recovery programs - operator's tool"
        "This package holds the program orvadr. It shows caches, locks, databases and\nerror codes.")
endif()

# The library runs uuidgen, which the list of shared libraries does not show.
set(CPACK_DEBIAN_RUNTIME_PACKAGE_DEPENDS uuid-runtime)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
# Debian's policy wants a trigger for ldconfig; CPack would write scripts, of which lintian warns. The
# postinst creates the lock directory.
set(CPACK_DEBIAN_RUNTIME_PACKAGE_CONTROL_EXTRA
    ${PROJECT_SOURCE_DIR}/cmake/debian/triggers
    ${PROJECT_SOURCE_DIR}/cmake/debian/postinst)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS
    "liborvadrcore${PROJECT_VERSION_MAJOR} (= ${PROJECT_VERSION}), libjsoncpp-dev")
set(CPACK_DEBIAN_EXAMPLES_PACKAGE_ARCHITECTURE all)
set(CPACK_DEBIAN_EXAMPLES_PACKAGE_RECOMMENDS liborvadrcore-dev)
set(CPACK_DEBIAN_EXAMPLES_PACKAGE_SUGGESTS "libcli11-dev, libcpp-httplib-dev, pkg-config")

find_program(GZIP_PROGRAM gzip REQUIRED)
execute_process(
    COMMAND ${GZIP_PROGRAM} -9nc ${PROJECT_SOURCE_DIR}/cmake/debian/changelog
    OUTPUT_FILE ${PROJECT_BINARY_DIR}/changelog.gz
    COMMAND_ERROR_IS_FATAL ANY)
include(CPack)
