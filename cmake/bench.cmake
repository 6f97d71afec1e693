# The benchmarks, with -DZUV_BUILD_BENCH=ON: the codec against other ways to read and write the same documents.
find_package(benchmark REQUIRED)
find_package(EXPAT REQUIRED)
find_package(LibXml2 REQUIRED)
find_package(pugixml REQUIRED)
file(GLOB ZUV_BENCH_SOURCES CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/bench/*.cpp)
add_executable(codec_bench ${ZUV_BENCH_SOURCES})
target_include_directories(codec_bench PRIVATE ${PROJECT_SOURCE_DIR}/src ${ZUV_GENERATED_DIR}/src)
target_link_libraries(codec_bench PRIVATE zuv_objects zuv_flags benchmark::benchmark EXPAT::EXPAT LibXml2::LibXml2
    pugixml::pugixml)
add_dependencies(codec_bench zuv_generated)

# The steps of a call one by one, for script/bench instructions.
add_executable(call_steps ${PROJECT_SOURCE_DIR}/bench/steps/main.cpp ${PROJECT_SOURCE_DIR}/bench/engine_run.cpp
    ${PROJECT_SOURCE_DIR}/bench/allocation_count.cpp ${PROJECT_SOURCE_DIR}/bench/call/server.cpp)
target_include_directories(call_steps PRIVATE ${PROJECT_SOURCE_DIR}/bench ${PROJECT_SOURCE_DIR}/src
    ${ZUV_GENERATED_DIR}/src)
target_link_libraries(call_steps PRIVATE zuv_objects zuv_flags Threads::Threads)
add_dependencies(call_steps zuv_generated)
