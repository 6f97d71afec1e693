# The steps of a call one by one, whose instructions script/count-steps counts: for script/bench, and for the test that holds
# them to the table of docs/performance.md.
add_executable(call_steps ${PROJECT_SOURCE_DIR}/bench/steps/main.cpp ${PROJECT_SOURCE_DIR}/bench/engine_run.cpp
    ${PROJECT_SOURCE_DIR}/bench/sample_profile.cpp ${PROJECT_SOURCE_DIR}/bench/allocation_count.cpp
    ${PROJECT_SOURCE_DIR}/bench/call/server.cpp)
target_include_directories(call_steps PRIVATE ${PROJECT_SOURCE_DIR}/bench ${PROJECT_SOURCE_DIR}/src
    ${ZUV_GENERATED_DIR}/src)
target_link_libraries(call_steps PRIVATE zuv_objects zuv_flags Threads::Threads)
add_dependencies(call_steps zuv_generated)
if(ZUV_BUILD_TESTS)
    add_test(NAME step_counts COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tests/bench/step_counts_test.py
        ${PROJECT_SOURCE_DIR} $<TARGET_FILE:call_steps>)
    set_tests_properties(step_counts PROPERTIES LABELS docs TIMEOUT 300)
endif()
