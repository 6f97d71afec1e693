# Debian packages by CPack, one for each component of install.cmake: `cpack -G DEB` in the build directory, or
# script/package.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_VENDOR "zuv_client_pro")
set(CPACK_PACKAGE_CONTACT "zuv_client_pro maintainers <maintainers@zuv.example>")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_COMPONENTS_ALL runtime development tools)
set(CPACK_COMPONENTS_GROUPING ONE_PER_GROUP)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${PROJECT_BINARY_DIR})
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)

# The library leaves OpenSSL's and zlib's symbols to the process, so shlibdeps doesn't see them.
set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME libzuv-client-pro${PROJECT_VERSION})
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_DEPENDS "libssl3, zlib1g")
set(CPACK_COMPONENT_RUNTIME_DESCRIPTION "SOAP client of a customer-care service: the shared library
 Through it a program talks to a customer-care web service: profiles, problem
 reports, status, inventories and update orders.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libzuv-client-pro-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS
    "libzuv-client-pro${PROJECT_VERSION} (= ${PROJECT_VERSION}), libssl-dev, zlib1g-dev")
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "SOAP client of a customer-care service: development files
 The headers, the files for find_package() and pkg-config, the contract of the
 service and an example.")

set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME zuv-tools)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION net)
set(CPACK_DEBIAN_TOOLS_PACKAGE_DEPENDS "libzuv-client-pro${PROJECT_VERSION} (= ${PROJECT_VERSION})")
set(CPACK_COMPONENT_TOOLS_DESCRIPTION "SOAP client of a customer-care service: programs
 zuv-service, a reference service with documents in SQLite, to develop and
 test hosts against; zuv, the command line, which calls services, checks
 documents and shows traces.")
include(${PROJECT_SOURCE_DIR}/cmake/package_documents.cmake)
set(CMAKE_SKIP_INSTALL_ALL_DEPENDENCY ON) # what is missing is built by whoever packages
include(CPack)
