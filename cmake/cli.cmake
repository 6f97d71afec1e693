# zuv, the command line, and the tests of both programs. To be included after service.cmake.
find_package(CLI11 REQUIRED)
find_package(nlohmann_json REQUIRED)
find_package(pugixml REQUIRED)
file(GLOB ZUV_CLI_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/cli/*.cpp)
add_executable(zuv ${ZUV_CLI_SOURCES} ${ZUV_GENERATED_DIR}/tools/contract_description.cpp)
target_include_directories(zuv PRIVATE ${PROJECT_SOURCE_DIR}/cli ${ZUV_GENERATED_DIR}/tools)
target_compile_definitions(zuv PRIVATE ZUV_VERSION="${PROJECT_VERSION}")
target_link_libraries(zuv PRIVATE ${ZUV_PROGRAM_LIBRARY} CLI11::CLI11 nlohmann_json::nlohmann_json pugixml::pugixml zuv_flags
    zuv_hardening)
add_dependencies(zuv zuv_generated)

# Where the Python scripts find the programs and each other.
set(ZUV_CLI_ENVIRONMENT "ZUV_SOURCE_DIR=${PROJECT_SOURCE_DIR}" "ZUV_BUILD_DIR=${PROJECT_BINARY_DIR}"
    "ZUV_PROGRAM=$<TARGET_FILE:zuv>" "ZUV_SERVICE_PROGRAM=$<TARGET_FILE:zuv-service>"
    "PYTHONPATH=${PROJECT_SOURCE_DIR}/tests/cli:${PROJECT_SOURCE_DIR}/tests/interop:${PROJECT_SOURCE_DIR}/tests/service")
if(ZUV_SANITIZE OR ZUV_FUZZ)
    list(APPEND ZUV_CLI_ENVIRONMENT ZUV_SANITIZED=1)
endif()

# Pictures of the page of a trace, in screenshots/ of the build tree. Needs chromium.
add_custom_target(docs_screenshots
    COMMAND ${CMAKE_COMMAND} -E env ${ZUV_CLI_ENVIRONMENT}
        /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/script/lib/screenshots.py ${PROJECT_BINARY_DIR}/screenshots
    DEPENDS zuv zuv-service
    VERBATIM)

if(TARGET classes_test) # documents as JSON, for every class
    target_sources(classes_test PRIVATE tests/classes/json_test.cpp ${ZUV_GENERATED_DIR}/tools/contract_description.cpp
        cli/json.cpp cli/contract.cpp cli/documents.cpp cli/nearest.cpp cli/replaced_file.cpp cli/simple_types.cpp cli/text_files.cpp)
    target_include_directories(classes_test PRIVATE ${PROJECT_SOURCE_DIR}/cli)
    target_link_libraries(classes_test PRIVATE CLI11::CLI11 nlohmann_json::nlohmann_json pugixml::pugixml)
endif()

# A test of a program is a Python script. They leave nothing in the source tree.
if(ZUV_BUILD_TESTS)
    foreach(part cli service)
        file(GLOB scripts CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/${part}/*_test.py)
        foreach(script ${scripts})
            get_filename_component(name ${script} NAME_WE)
            add_test(NAME ${part}_${name} COMMAND /usr/bin/python3 -B -m unittest ${name})
            set_tests_properties(${part}_${name} PROPERTIES LABELS ${part} TIMEOUT 300 ENVIRONMENT "${ZUV_CLI_ENVIRONMENT}")
        endforeach()
    endforeach()
endif()
