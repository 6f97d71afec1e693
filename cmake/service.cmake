# zuv-service: the program, its parts as a library for the tests, and their tests. To be included after tests.cmake.
find_package(SQLite3 REQUIRED)
find_package(CLI11 REQUIRED)
find_package(nlohmann_json REQUIRED)
file(GLOB ZUV_SERVICE_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/service/*.cpp)
list(REMOVE_ITEM ZUV_SERVICE_SOURCES ${PROJECT_SOURCE_DIR}/service/main.cpp)
zuv_embed_contract(${PROJECT_SOURCE_DIR}/schema ${PROJECT_BINARY_DIR}/contract_files_text.cpp)
file(READ ${PROJECT_SOURCE_DIR}/service/front_page.html ZUV_FRONT_PAGE)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/service/front_page.html)
file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/service_text/front_page_text.h @ONLY
    CONTENT "#pragma once\n#include <string_view>\nconstexpr std::string_view FRONT_PAGE = R\"page(@ZUV_FRONT_PAGE@)page\";\n")
add_library(zuv_service_parts STATIC ${ZUV_SERVICE_SOURCES} ${PROJECT_BINARY_DIR}/contract_files_text.cpp)
target_include_directories(zuv_service_parts PUBLIC ${PROJECT_SOURCE_DIR}/service ${PROJECT_BINARY_DIR}/service_text
    $<TARGET_PROPERTY:zuv_objects,INTERFACE_INCLUDE_DIRECTORIES>)
target_link_libraries(zuv_service_parts PUBLIC SQLite::SQLite3 Threads::Threads PRIVATE nlohmann_json::nlohmann_json zuv_flags
    zuv_hardening)
add_dependencies(zuv_service_parts zuv_generated)

add_executable(zuv-service ${PROJECT_SOURCE_DIR}/service/main.cpp)
target_compile_definitions(zuv-service PRIVATE ZUV_VERSION="${PROJECT_VERSION}")
target_link_libraries(zuv-service PRIVATE zuv_service_parts ${ZUV_PROGRAM_LIBRARY} CLI11::CLI11 zuv_flags zuv_hardening)

if(ZUV_BUILD_TESTS) # of its parts; those of the program are run with those of the command line
    file(GLOB ZUV_SERVICE_TESTS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/tests/service/*_test.cpp)
    foreach(source ${ZUV_SERVICE_TESTS})
        get_filename_component(name ${source} NAME_WE)
        zuv_add_test(service_${name} ${source})
        target_link_libraries(service_${name} PRIVATE zuv_service_parts zuv_objects)
    endforeach()
endif()
