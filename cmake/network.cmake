# Real servers and proxies, networks that fail, and system calls counted. To be included after interop.cmake.
add_executable(call_client ${INTEROP}/call_client.cpp)
target_include_directories(call_client PRIVATE ${PROJECT_SOURCE_DIR}/tests)
target_link_libraries(call_client PRIVATE zuv_objects zuv_flags CLI11::CLI11)

function(zuv_add_network_test name)
    add_test(NAME network_${name} COMMAND /usr/bin/python3 -B ${INTEROP}/${name}.py $<TARGET_FILE:call_client> ${ARGN})
    set_tests_properties(network_${name} PROPERTIES LABELS network TIMEOUT 300 SKIP_RETURN_CODE 77)
endfunction()
zuv_add_network_test(servers $<TARGET_FILE:zuv> $<TARGET_FILE:zuv-service> ${NPM_SERVICE} ${ZUV_SCHEMA})
set_tests_properties(network_servers PROPERTIES FIXTURES_REQUIRED npm_service)
zuv_add_network_test(network_faults $<TARGET_FILE:zuv-service>)
if(NOT (ZUV_SANITIZE OR ZUV_FUZZ)) # a sanitizer makes calls of its own, and can't be traced
    zuv_add_network_test(system_calls $<TARGET_FILE:zuv-service>)
endif()
