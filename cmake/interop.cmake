# Independent peers: toolkits that are not the project's call the service.
add_test(NAME interop_zeep_profile
    COMMAND /usr/bin/python3 ${PROJECT_SOURCE_DIR}/tests/interop/zeep_profile.py $<TARGET_FILE:zuv-service>
        ${PROJECT_SOURCE_DIR}/schema)
set_tests_properties(interop_zeep_profile PROPERTIES LABELS interop TIMEOUT 120)
add_test(NAME interop_npm_profile
    COMMAND /usr/bin/python3 ${PROJECT_SOURCE_DIR}/tests/interop/npm_profile.py $<TARGET_FILE:profile_host>
        ${PROJECT_SOURCE_DIR}/schema ${PROJECT_BINARY_DIR}/npm_profile)
set_tests_properties(interop_npm_profile PROPERTIES LABELS interop TIMEOUT 180)
