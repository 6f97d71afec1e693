# The benchmark of calls, with -DZUV_BUILD_BENCH=ON: the library, sockets by hand and libcurl.
find_package(CURL REQUIRED)
find_package(pugixml REQUIRED)
find_package(CLI11 REQUIRED)
file(GLOB ZUV_CALL_BENCH_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/bench/call/*.cpp)
add_executable(call_bench ${ZUV_CALL_BENCH_SOURCES} ${PROJECT_SOURCE_DIR}/bench/engine_run.cpp
    ${PROJECT_SOURCE_DIR}/bench/sample_profile.cpp)
target_include_directories(call_bench PRIVATE ${PROJECT_SOURCE_DIR}/bench ${PROJECT_SOURCE_DIR}/src ${ZUV_GENERATED_DIR}/src
    ${PROJECT_SOURCE_DIR}/tests)
target_link_libraries(call_bench PRIVATE zuv_objects zuv_flags CURL::libcurl pugixml::pugixml CLI11::CLI11 Threads::Threads)
add_dependencies(call_bench zuv_generated)
