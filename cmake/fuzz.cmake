# The fuzz targets, with clang and -DZUV_FUZZ=ON: one executable for each file of tests/fuzz.
file(GLOB ZUV_FUZZ_TARGETS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/fuzz/*_fuzz.cpp)
foreach(source ${ZUV_FUZZ_TARGETS})
    get_filename_component(name ${source} NAME_WE)
    add_executable(${name} ${source})
    target_include_directories(${name} PRIVATE ${PROJECT_SOURCE_DIR}/tests ${PROJECT_SOURCE_DIR}/src
        ${ZUV_GENERATED_DIR}/src)
    target_link_libraries(${name} PRIVATE zuv_objects)
    target_link_options(${name} PRIVATE -fsanitize=fuzzer)
    # Seeds and old findings, then a few seconds of fuzzing.
    string(REPLACE "_fuzz" "" target ${name})
    set(seeds "")
    foreach(folder fuzz/corpus samples)
        if(IS_DIRECTORY ${PROJECT_SOURCE_DIR}/tests/${folder}/${target})
            list(APPEND seeds ${PROJECT_SOURCE_DIR}/tests/${folder}/${target})
        endif()
    endforeach()
    add_test(NAME ${name} COMMAND ${name} -max_total_time=10 -timeout=10 -rss_limit_mb=2048 -verbosity=0
        ${PROJECT_BINARY_DIR}/corpus/${target} ${seeds})
    file(MAKE_DIRECTORY ${PROJECT_BINARY_DIR}/corpus/${target})
    set_tests_properties(${name} PROPERTIES LABELS fuzz TIMEOUT 120)
endforeach()

# One target has a fault on purpose, and has to find it.
add_executable(fault_fuzz ${PROJECT_SOURCE_DIR}/tests/fuzz/http_head_fuzz.cpp)
target_include_directories(fault_fuzz PRIVATE ${PROJECT_SOURCE_DIR}/tests)
target_compile_definitions(fault_fuzz PRIVATE ZUV_FUZZ_FAULT)
target_link_libraries(fault_fuzz PRIVATE zuv_objects)
target_link_options(fault_fuzz PRIVATE -fsanitize=fuzzer)
add_test(NAME fuzz_fault COMMAND sh ${PROJECT_SOURCE_DIR}/tests/fuzz/fault_is_found.sh $<TARGET_FILE:fault_fuzz>
    ${PROJECT_SOURCE_DIR}/tests/fuzz/corpus/http_head ${PROJECT_BINARY_DIR}/fault)
set_tests_properties(fuzz_fault PROPERTIES LABELS fuzz TIMEOUT 120)
