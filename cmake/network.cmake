# Real servers and proxies, networks that fail, and system calls counted. To be included behind interop.cmake.
add_executable(call_client ${INTEROP}/call_client.cpp)
target_link_libraries(call_client PRIVATE zuv_objects zuv_flags CLI11::CLI11)

function(zuv_add_network_test name)
    add_test(NAME network_${name} COMMAND /usr/bin/python3 -B ${INTEROP}/${name}.py $<TARGET_FILE:call_client>
        $<TARGET_FILE:zuv-service>)
    set_tests_properties(network_${name} PROPERTIES LABELS network TIMEOUT 300 SKIP_RETURN_CODE 77)
endfunction()
zuv_add_network_test(real_servers)
zuv_add_network_test(real_proxies)
zuv_add_network_test(network_faults)
if(NOT (ZUV_SANITIZE OR ZUV_FUZZ)) # a sanitizer makes calls of its own, and can't be traced
    zuv_add_network_test(system_calls)
endif()
