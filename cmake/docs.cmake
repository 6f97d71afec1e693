# The pages: what they show is compiled and run. To be included behind service.cmake.
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/README.md)

# The README's host, at a free port in place of the one that it names.
file(READ ${PROJECT_SOURCE_DIR}/README.md readme)
if(NOT readme MATCHES "```cpp\n([^`]*)```")
    message(FATAL_ERROR "README.md: the host program was not found")
endif()
string(REPLACE "\"http://127.0.0.1:9080/zuv/v1.0/services/Profile\"" "std::getenv(\"ZUV_README_ENDPOINT\")" program
    "#include <cstdlib>\n${CMAKE_MATCH_1}")
file(CONFIGURE OUTPUT readme_host.cpp CONTENT "${program}" @ONLY)
add_executable(readme_host ${PROJECT_BINARY_DIR}/readme_host.cpp)
target_link_libraries(readme_host PRIVATE zuv_objects zuv_flags)

add_test(NAME pages COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tests/docs/pages_test.py ${PROJECT_SOURCE_DIR}
    $<TARGET_FILE:zuv-service> $<TARGET_FILE:guide> $<TARGET_FILE:readme_host>)
set_tests_properties(pages PROPERTIES TIMEOUT 120)
