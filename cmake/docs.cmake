# The documents: the target "docs" makes the API reference, with the page about the command line and its pictures, and the wire
# reference in docs/ of the build; the tests compile and run what the pages show. To be included after cli.cmake.
configure_file(${PROJECT_SOURCE_DIR}/docs/Doxyfile.in Doxyfile @ONLY)
file(MAKE_DIRECTORY ${PROJECT_BINARY_DIR}/docs)
set(ZUV_WIRE_REFERENCE /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tools/wire_reference/wire_reference.py
    ${PROJECT_SOURCE_DIR}/schema ${PROJECT_BINARY_DIR}/docs/wire)
add_custom_target(docs COMMAND doxygen Doxyfile COMMAND ${ZUV_WIRE_REFERENCE} DEPENDS zuv_generated docs_screenshots
    VERBATIM)

add_test(NAME docs COMMAND ${CMAKE_COMMAND} --build . --target docs WORKING_DIRECTORY ${PROJECT_BINARY_DIR})
set_tests_properties(docs PROPERTIES FIXTURES_SETUP docs)
add_test(NAME built_docs COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tests/docs/built_docs_test.py
    ${PROJECT_BINARY_DIR}/docs)
set_tests_properties(built_docs PROPERTIES FIXTURES_REQUIRED docs)
add_test(NAME wire_reference COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tests/docs/wire_reference_test.py
    ${PROJECT_SOURCE_DIR} ${ZUV_GENERATED_DIR})

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
set_tests_properties(docs built_docs wire_reference pages PROPERTIES LABELS docs TIMEOUT 120)
