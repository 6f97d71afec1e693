# Tests of the generator and of what it writes.
set(GENERATOR_TESTS ${PROJECT_SOURCE_DIR}/tests/generator)

# Contracts in, text or a refusal out. Not where the generator was built elsewhere: its tests belong there as well.
if(TARGET contract_translator)
    add_executable(generator_test ${GENERATOR_TESTS}/generator_test.cpp)
    target_compile_definitions(generator_test PRIVATE
        GENERATOR_TEST_DATA="${GENERATOR_TESTS}"
        PUBLISHED_CONTRACT="${PROJECT_SOURCE_DIR}/schema"
        CONTRACT2CPP="$<TARGET_FILE:contract2cpp>")
    target_link_libraries(generator_test PRIVATE contract_translator zuv_flags GTest::gtest_main Threads::Threads)
    add_dependencies(generator_test contract2cpp)
    add_test(NAME generator_test COMMAND generator_test)
endif()

# Each public header compiles alone in C++17; a failure is a failure of the build.
file(GLOB ZUV_PUBLIC_HEADERS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/include/zuv_client_pro/*.h)
set(header_units)
foreach(header ${ZUV_PUBLIC_HEADERS} ${ZUV_GENERATED_HEADERS})
    get_filename_component(name ${header} NAME)
    set(unit ${PROJECT_BINARY_DIR}/public_headers/${name}.cpp)
    file(CONFIGURE OUTPUT ${unit} CONTENT "#include <zuv_client_pro/${name}>\n" @ONLY)
    list(APPEND header_units ${unit})
endforeach()
add_library(public_headers_alone OBJECT ${header_units})
set_target_properties(public_headers_alone PROPERTIES CXX_STANDARD 17)
target_include_directories(public_headers_alone PRIVATE ${PROJECT_SOURCE_DIR}/include ${ZUV_GENERATED_DIR}/include)
target_link_libraries(public_headers_alone PRIVATE zuv_flags)
add_dependencies(public_headers_alone zuv_generated)

# One of everything, translated, compiled and sent through the rules. Its registry and its namespaces stand in for the
# library's: being objects of the program, they come before those in the archive.
zuv_translate_contract(${GENERATOR_TESTS}/everything ${PROJECT_BINARY_DIR}/everything everything_headers everything_sources)
add_custom_target(everything_generated DEPENDS ${everything_headers} ${everything_sources})
add_executable(everything_test ${GENERATOR_TESTS}/everything_test.cpp ${everything_sources} ${everything_headers})
target_include_directories(everything_test PRIVATE
    ${PROJECT_BINARY_DIR}/everything/include ${PROJECT_BINARY_DIR}/everything/src
    ${PROJECT_SOURCE_DIR}/src ${PROJECT_SOURCE_DIR}/tests)
target_link_libraries(everything_test PRIVATE zuv_objects zuv_flags GTest::gtest_main Threads::Threads)
add_dependencies(everything_test everything_generated)
add_test(NAME everything_test COMMAND everything_test)
