# What Debian and whoever audits a machine want of a package besides its programs: copyright, changelog, symbols of the library, and a
# bill of materials (SPDX). No time of the build is in it. To be included by packages.cmake.
set(ZUV_RELEASE_DAY 2026-11-22) # of PROJECT_VERSION
set(ZUV_RELEASE_DATE "Sun, 22 Nov 2026")
set(package_files ${PROJECT_SOURCE_DIR}/cmake/package_files)
set(made ${PROJECT_BINARY_DIR}/package_files)

# --- the bill of materials: what the library and the programs are made from ---

set(ZUV_SBOM_PACKAGES)
set(ZUV_SBOM_RELATIONSHIPS)
function(zuv_sbom_part name version license from relationship to) # `name` is @ in `from` and `to`
    string(REPLACE "_" "-" id SPDXRef-${name})
    string(REPLACE "@" ${id} relation "
    { \"spdxElementId\": \"${from}\", \"relationshipType\": \"${relationship}\", \"relatedSpdxElement\": \"${to}\" }")
    set(part "
    { \"SPDXID\": \"${id}\", \"name\": \"${name}\", \"versionInfo\": \"${version}\", \"licenseDeclared\": \"${license}\",
      \"licenseConcluded\": \"NOASSERTION\", \"copyrightText\": \"NOASSERTION\", \"downloadLocation\": \"NOASSERTION\",
      \"filesAnalyzed\": false }")
    string(JOIN "," packages ${ZUV_SBOM_PACKAGES} "${part}")
    string(JOIN "," relations ${ZUV_SBOM_RELATIONSHIPS} "${relation}")
    set(ZUV_SBOM_PACKAGES "${packages}" PARENT_SCOPE)
    set(ZUV_SBOM_RELATIONSHIPS "${relations}" PARENT_SCOPE)
endfunction()
set(itself SPDXRef-zuv-client-pro)
zuv_sbom_part(zuv_client_pro ${PROJECT_VERSION} NONE SPDXRef-DOCUMENT DESCRIBES @)
zuv_sbom_part(openssl ${OPENSSL_VERSION} Apache-2.0 ${itself} DYNAMIC_LINK @)
zuv_sbom_part(zlib ${ZLIB_VERSION_STRING} Zlib ${itself} DYNAMIC_LINK @)
if(ZUV_BUILD_PROGRAMS)
    zuv_sbom_part(sqlite ${SQLite3_VERSION} blessing ${itself} DYNAMIC_LINK @)
    zuv_sbom_part(pugixml ${pugixml_VERSION} MIT ${itself} DYNAMIC_LINK @)
    zuv_sbom_part(CLI11 ${CLI11_VERSION} BSD-3-Clause @ BUILD_DEPENDENCY_OF ${itself})
    zuv_sbom_part(nlohmann-json ${nlohmann_json_VERSION} MIT @ BUILD_DEPENDENCY_OF ${itself})
endif()
configure_file(${package_files}/sbom.spdx.json.in ${made}/sbom.spdx.json @ONLY)

# --- in the folder of each package ---

configure_file(${package_files}/copyright.in ${made}/copyright @ONLY)
configure_file(${package_files}/changelog.in ${made}/changelog @ONLY)
configure_file(${package_files}/runtime.lintian-overrides.in ${made}/libzuv-client-pro${PROJECT_VERSION} @ONLY)
function(zuv_compress from to) # without a time in it
    execute_process(COMMAND gzip -9nc INPUT_FILE ${from} OUTPUT_FILE ${to} COMMAND_ERROR_IS_FATAL ANY)
endfunction()
zuv_compress(${made}/changelog ${made}/changelog.gz)
foreach(component RUNTIME DEVELOPMENT TOOLS)
    string(TOLOWER ${component} name)
    install(FILES ${made}/copyright ${made}/changelog.gz ${made}/sbom.spdx.json
        DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${CPACK_DEBIAN_${component}_PACKAGE_NAME} COMPONENT ${name})
endforeach()
install(FILES ${made}/libzuv-client-pro${PROJECT_VERSION} DESTINATION ${CMAKE_INSTALL_DATADIR}/lintian/overrides
    COMPONENT runtime)
foreach(manual zuv zuv-service)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/docs/man/${manual}.1)
    zuv_compress(${PROJECT_SOURCE_DIR}/docs/man/${manual}.1 ${made}/${manual}.1.gz)
    install(FILES ${made}/${manual}.1.gz DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT tools)
endforeach()

# --- what dpkg knows of the library ---

find_program(DPKG_GENSYMBOLS dpkg-gensymbols)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_CONTROL_EXTRA ${package_files}/triggers)
if(DPKG_GENSYMBOLS)
    add_custom_command(TARGET zuv_client_pro POST_BUILD
        COMMAND ${DPKG_GENSYMBOLS} -q -p${CPACK_DEBIAN_RUNTIME_PACKAGE_NAME} -v${PROJECT_VERSION}
            -e$<TARGET_FILE:zuv_client_pro> -O${made}/symbols
        VERBATIM)
    list(APPEND CPACK_DEBIAN_RUNTIME_PACKAGE_CONTROL_EXTRA ${made}/symbols)
endif()
