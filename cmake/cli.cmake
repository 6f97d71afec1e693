# zuv, the command line, and its tests.
find_package(CLI11 REQUIRED)
find_package(nlohmann_json REQUIRED)
file(GLOB ZUV_CLI_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/cli/*.cpp)
add_executable(zuv ${ZUV_CLI_SOURCES} ${ZUV_GENERATED_DIR}/tools/contract_description.cpp)
target_include_directories(zuv PRIVATE ${PROJECT_SOURCE_DIR}/cli ${ZUV_GENERATED_DIR}/tools)
target_compile_definitions(zuv PRIVATE ZUV_VERSION="${PROJECT_VERSION}")
target_link_libraries(zuv PRIVATE zuv_objects CLI11::CLI11 nlohmann_json::nlohmann_json pugixml::pugixml zuv_flags
    zuv_hardening)
add_dependencies(zuv zuv_generated)

# Where the Python scripts find the programs.
set(ZUV_CLI_ENVIRONMENT "ZUV_SOURCE_DIR=${PROJECT_SOURCE_DIR}" "ZUV_BUILD_DIR=${PROJECT_BINARY_DIR}"
    "ZUV_PROGRAM=$<TARGET_FILE:zuv>" "ZUV_SERVICE_PROGRAM=$<TARGET_FILE:zuv-service>")

# Pictures of the page of a trace, in screenshots/ of the build tree. Needs chromium.
add_custom_target(docs_screenshots
    COMMAND ${CMAKE_COMMAND} -E env ${ZUV_CLI_ENVIRONMENT}
        /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/script/lib/screenshots.py ${PROJECT_BINARY_DIR}/screenshots
    DEPENDS zuv zuv-service
    VERBATIM)

# A test of the program is a Python script. They leave nothing in the source tree.
if(ZUV_BUILD_TESTS)
    file(GLOB ZUV_CLI_TESTS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/cli/*_test.py)
    foreach(script ${ZUV_CLI_TESTS})
        get_filename_component(name ${script} NAME_WE)
        add_test(NAME cli_${name} COMMAND /usr/bin/python3 -B ${script})
        set_tests_properties(cli_${name} PROPERTIES LABELS cli TIMEOUT 300 ENVIRONMENT "${ZUV_CLI_ENVIRONMENT}")
    endforeach()
endif()
