# Independent peers: other toolkits call the service, the library calls a service on another toolkit. And endurance. To be
# included after service.cmake.
set(INTEROP ${PROJECT_SOURCE_DIR}/tests/interop)
set(ZUV_SCHEMA ${PROJECT_SOURCE_DIR}/schema)

# The five ports on the npm package "soap"; its packages go to the build tree.
set(NPM_SERVICE ${PROJECT_BINARY_DIR}/soap_server)
foreach(file package.json package-lock.json server.js)
    configure_file(${INTEROP}/soap_server/${file} ${NPM_SERVICE}/${file} COPYONLY)
endforeach()
add_test(NAME interop_npm_install COMMAND npm ci --no-audit --no-fund --loglevel=error WORKING_DIRECTORY ${NPM_SERVICE})
set_tests_properties(interop_npm_install PROPERTIES FIXTURES_SETUP npm_service LABELS interop TIMEOUT 300)

# Debian's Python, for it has the packages. The scripts leave nothing in the source tree.
function(zuv_add_interop name)
    add_test(NAME interop_${name} COMMAND /usr/bin/python3 -B ${INTEROP}/${name}.py ${ARGN} ${ZUV_SCHEMA})
    set_tests_properties(interop_${name} PROPERTIES LABELS interop TIMEOUT 300)
endfunction()
zuv_add_interop(zeep_ports $<TARGET_FILE:zuv-service>)
zuv_add_interop(contract_handed_out $<TARGET_FILE:zuv-service>)
zuv_add_interop(mono_documents $<TARGET_FILE:zuv-service>)
zuv_add_interop(client_ports $<TARGET_FILE:zuv> $<TARGET_FILE:care_host> $<TARGET_FILE:problem_report_host>
    $<TARGET_FILE:zuv-service> ${NPM_SERVICE})
set_tests_properties(interop_client_ports PROPERTIES FIXTURES_REQUIRED npm_service)

# What follows looks at memory itself, which a sanitizer changes.
if(ZUV_SANITIZE OR ZUV_FUZZ)
    return()
endif()
add_test(NAME transfer COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/script/lib/transfer.py 40000000 $<TARGET_FILE:file_host>
    $<TARGET_FILE:zuv-service> $<TARGET_FILE:zuv>)
set_tests_properties(transfer PROPERTIES LABELS soak TIMEOUT 300)

zuv_add_test(soak_test ${PROJECT_SOURCE_DIR}/tests/soak/soak_test.cpp) # script/soak makes more calls
target_compile_definitions(soak_test PRIVATE ZUV_SERVICE_PROGRAM="$<TARGET_FILE:zuv-service>")
add_dependencies(soak_test zuv-service)
set_tests_properties(soak_test PROPERTIES LABELS soak)

# A whole call under valgrind. The test executables bring a malloc of their own, which has to be named to it.
add_test(NAME call_cycle_valgrind COMMAND sh -c
    "command -v valgrind >/dev/null || { echo 'skipped: valgrind is not installed'; exit 77; }
     exec valgrind --quiet --soname-synonyms=somalloc=NONE --leak-check=full --show-leak-kinds=definite,indirect \
         --errors-for-leak-kinds=definite,indirect --error-exitcode=9 '$<TARGET_FILE:call_cycle_test>'")
set_tests_properties(call_cycle_valgrind PROPERTIES LABELS soak TIMEOUT 600 SKIP_RETURN_CODE 77)
