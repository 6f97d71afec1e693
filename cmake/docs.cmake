# The documents: the target "docs" makes the API reference, with the page about the command line and its pictures, and the wire
# reference, in docs/ of the build. Their tests: docs_tests.cmake. To be included after cli.cmake.
configure_file(${PROJECT_SOURCE_DIR}/docs/Doxyfile.in Doxyfile @ONLY)
file(MAKE_DIRECTORY ${PROJECT_BINARY_DIR}/docs)
set(ZUV_WIRE_REFERENCE /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tools/wire_reference/wire_reference.py
    ${PROJECT_SOURCE_DIR}/schema ${PROJECT_BINARY_DIR}/docs/wire)
add_custom_target(docs COMMAND doxygen Doxyfile COMMAND ${ZUV_WIRE_REFERENCE} DEPENDS zuv_generated docs_screenshots
    VERBATIM)
