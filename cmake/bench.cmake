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
