# The test suite: one executable for each file of tests/unit, and the suites that bring their own list.
find_package(GTest REQUIRED)
file(GLOB ZUV_TEST_SUPPORT CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/support/*.cpp)
add_library(zuv_test_support OBJECT ${ZUV_TEST_SUPPORT})
target_include_directories(zuv_test_support PUBLIC ${PROJECT_SOURCE_DIR}/tests ${PROJECT_SOURCE_DIR}/src
    ${PROJECT_SOURCE_DIR}/include)
target_link_libraries(zuv_test_support PUBLIC zuv_flags GTest::gmock Threads::Threads)

# For script/torture: what a test is linked with, and a service that it starts loads.
if(ZUV_SHARED_OBJECTS)
    target_compile_definitions(zuv_test_support PRIVATE ZUV_SHARED_OBJECTS)
    add_library(zuv_torture SHARED ${PROJECT_SOURCE_DIR}/tests/support/failing_malloc.cpp
        ${PROJECT_SOURCE_DIR}/tests/support/torture.cpp)
    target_include_directories(zuv_torture PRIVATE ${PROJECT_SOURCE_DIR}/tests)
    target_compile_definitions(zuv_torture PRIVATE ZUV_SHARED_OBJECTS)
    target_compile_options(zuv_torture PRIVATE -ftls-model=initial-exec)
endif()

# ThreadSanitizer wants its addresses free, which the layouts of newer kernels don't always leave; and memory is allocated before
# its own start.
set(ZUV_TEST_LAUNCHER)
if(ZUV_THREADS)
    execute_process(COMMAND setarch -R true RESULT_VARIABLE refused ERROR_QUIET)
    if(refused EQUAL 0)
        set(ZUV_TEST_LAUNCHER setarch -R)
    endif()
    set_source_files_properties(${PROJECT_SOURCE_DIR}/tests/support/failing_malloc.cpp PROPERTIES COMPILE_OPTIONS
        -fno-sanitize=thread)
endif()

# A GoogleTest executable, one CTest case.
function(zuv_add_test name)
    add_executable(${name} ${ARGN})
    target_include_directories(${name} PRIVATE ${ZUV_GENERATED_DIR}/src ${ZUV_GENERATED_DIR}/tools)
    target_link_libraries(${name} PRIVATE zuv_test_support zuv_objects GTest::gtest_main)
    if(ZUV_TEST_LAUNCHER)
        add_test(NAME ${name} COMMAND ${ZUV_TEST_LAUNCHER} $<TARGET_FILE:${name}>)
    else() # by its name, so that an emulator takes part where there is one
        add_test(NAME ${name} COMMAND ${name})
    endif()
    set_tests_properties(${name} PROPERTIES TIMEOUT 300)
endfunction()

file(GLOB ZUV_UNIT_TESTS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/unit/*_test.cpp)
foreach(source ${ZUV_UNIT_TESTS})
    get_filename_component(name ${source} NAME_WE)
    zuv_add_test(${name} ${source})
endforeach()
target_compile_definitions(zuv_test_support PUBLIC ZUV_GOLDEN_DIR="${PROJECT_SOURCE_DIR}/tests/golden"
    ZUV_SCHEMA_DIR="${PROJECT_SOURCE_DIR}/schema" ZUV_SAMPLE_DIR="${PROJECT_SOURCE_DIR}/tests/samples")

# A plug-in that brings a copy of the library: nothing of it is seen from outside. Sanitizers look at one copy only.
if(NOT (ZUV_SANITIZE OR ZUV_THREADS OR ZUV_FUZZ OR ZUV_COVERAGE OR ZUV_SHARED_OBJECTS))
    add_library(host_plugin MODULE ${PROJECT_SOURCE_DIR}/tests/host/plugin.cpp)
    target_include_directories(host_plugin PRIVATE ${PROJECT_SOURCE_DIR}/tests)
    target_link_libraries(host_plugin PRIVATE zuv_objects zuv_flags)
    target_link_options(host_plugin PRIVATE LINKER:--exclude-libs,ALL)
    target_compile_definitions(host_conditions_test PRIVATE ZUV_PLUGIN="$<TARGET_FILE:host_plugin>")
    add_dependencies(host_conditions_test host_plugin)
endif()

# Another parser, to compare the reader with.
find_package(LibXml2 REQUIRED)
target_link_libraries(xml_reference_test PRIVATE LibXml2::LibXml2)
if(ZUV_FUZZ OR ZUV_SANITIZE)
    target_compile_definitions(zuv_test_support PUBLIC ZUV_SANITIZED)
endif()
