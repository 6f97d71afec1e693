# Tests of the documents: what is built is complete, and what the pages show is so. To be included after docs.cmake.
set(DOCS_TESTS ${PROJECT_SOURCE_DIR}/tests/docs)
add_test(NAME docs COMMAND ${CMAKE_COMMAND} --build . --target docs WORKING_DIRECTORY ${PROJECT_BINARY_DIR})
set_tests_properties(docs PROPERTIES FIXTURES_SETUP docs)
add_test(NAME built_docs COMMAND /usr/bin/python3 -B ${DOCS_TESTS}/built_docs_test.py ${PROJECT_SOURCE_DIR}
    ${PROJECT_BINARY_DIR}/Doxyfile ${PROJECT_BINARY_DIR}/docs)
set_tests_properties(built_docs PROPERTIES FIXTURES_REQUIRED docs)
add_test(NAME wire_reference COMMAND /usr/bin/python3 -B ${DOCS_TESTS}/wire_reference_test.py ${PROJECT_SOURCE_DIR}
    ${ZUV_GENERATED_DIR})
add_test(NAME docs_comment_files COMMAND /usr/bin/python3 -B ${DOCS_TESTS}/comment_files_test.py ${PROJECT_SOURCE_DIR}
    ${ZUV_GENERATED_DIR})
set_tests_properties(docs_comment_files PROPERTIES SKIP_RETURN_CODE 77)

set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/README.md)

# The README's host program, at a free port in place of the one that it names.
file(READ ${PROJECT_SOURCE_DIR}/README.md readme)
if(NOT readme MATCHES "```cpp\n([^`]*)```")
    message(FATAL_ERROR "README.md: the host program was not found")
endif()
string(REPLACE "\"http://127.0.0.1:9080/zuv/v1.0/services/Profile\"" "std::getenv(\"ZUV_README_ENDPOINT\")" program
    "#include <cstdlib>\n${CMAKE_MATCH_1}")
file(CONFIGURE OUTPUT readme_host.cpp CONTENT "${program}" @ONLY)
add_executable(readme_host ${PROJECT_BINARY_DIR}/readme_host.cpp)
target_link_libraries(readme_host PRIVATE zuv_objects zuv_flags)

add_test(NAME pages COMMAND /usr/bin/python3 -B ${DOCS_TESTS}/pages_test.py ${PROJECT_SOURCE_DIR}
    $<TARGET_FILE:zuv-service> $<TARGET_FILE:guide> $<TARGET_FILE:readme_host>)
set_tests_properties(docs built_docs wire_reference docs_comment_files pages PROPERTIES LABELS docs TIMEOUT 180)
