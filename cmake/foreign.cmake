# Documents as other senders write them: composed by a script from the schemas alone, read and rewritten by the library.
add_executable(foreign_rewrite ${PROJECT_SOURCE_DIR}/tests/foreign/rewrite.cpp)
target_link_libraries(foreign_rewrite PRIVATE zuv_test_support zuv_objects)
add_test(NAME foreign_documents COMMAND /usr/bin/python3 -B ${PROJECT_SOURCE_DIR}/tests/foreign/foreign_documents.py
    $<TARGET_FILE:foreign_rewrite> ${PROJECT_SOURCE_DIR}/schema)
set_tests_properties(foreign_documents PROPERTIES TIMEOUT 300)
