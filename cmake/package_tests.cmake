# The shared object as a user gets it: what it exports and needs, and hosts built from the packages alone. To be
# included after install.cmake and packages.cmake.
if(ZUV_SANITIZE OR ZUV_THREADS OR ZUV_FUZZ OR ZUV_COVERAGE)
    return() # such objects are not what is handed out
endif()
set(PACKAGE_TESTS ${PROJECT_SOURCE_DIR}/tests/package)
set(TEST_PACKAGES ${PROJECT_BINARY_DIR}/package_tests/packages)

add_test(NAME library_surface COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/script/lib/abi_surface.py
    $<TARGET_FILE:zuv_client_pro> ${PROJECT_SOURCE_DIR}/docs/interface/exported_names.txt
    ${PROJECT_SOURCE_DIR}/include/zuv_client_pro ${ZUV_GENERATED_DIR}/include/zuv_client_pro)

if(CMAKE_BUILD_TYPE MATCHES Rel) # else copies go unchecked
    add_test(NAME hardening COMMAND /usr/bin/python3 -B ${PACKAGE_TESTS}/hardening_test.py $<TARGET_FILE:zuv_client_pro>
        $<TARGET_FILE:zuv-service> $<TARGET_FILE:zuv>)
endif()

add_test(NAME public_headers COMMAND sh ${PACKAGE_TESTS}/public_headers.sh ${PROJECT_SOURCE_DIR}/include
    ${ZUV_GENERATED_DIR}/include)

add_test(NAME package_make COMMAND ${CMAKE_CPACK_COMMAND} --config ${PROJECT_BINARY_DIR}/CPackConfig.cmake -G DEB
    -B ${TEST_PACKAGES})
set_tests_properties(package_make PROPERTIES FIXTURES_SETUP packages TIMEOUT 120)
add_test(NAME build_ways COMMAND sh ${PACKAGE_TESTS}/build_ways.sh ${PROJECT_SOURCE_DIR} $<TARGET_FILE:contract2cpp>
    ${PROJECT_BINARY_DIR}/package_tests/ways)
set_tests_properties(build_ways PROPERTIES LABELS package TIMEOUT 300)
foreach(way cmake pkg-config)
    add_test(NAME package_host_${way} COMMAND sh ${PACKAGE_TESTS}/extracted.sh ${way} ${TEST_PACKAGES}
        ${PROJECT_BINARY_DIR}/package_tests/${way})
endforeach()
add_test(NAME package_clean_root COMMAND bash ${PACKAGE_TESTS}/clean_root.sh ${TEST_PACKAGES}
    ${PROJECT_BINARY_DIR}/package_tests/clean_root)
add_test(NAME package_lintian COMMAND sh ${PACKAGE_TESTS}/lintian.sh ${TEST_PACKAGES})
add_test(NAME package_readme COMMAND /usr/bin/python3 -B ${PACKAGE_TESTS}/readme_test.py ${PROJECT_SOURCE_DIR}
    ${PROJECT_BINARY_DIR} ${TEST_PACKAGES})
set_tests_properties(package_host_cmake package_host_pkg-config package_clean_root package_readme package_lintian PROPERTIES
    FIXTURES_REQUIRED packages SKIP_RETURN_CODE 77 LABELS package TIMEOUT 600)
