# The example hosts: each is one source file over the public headers and the shared object, as a host of its own would be.
foreach(name profile_host care_host problem_report_host file_host guide)
    add_executable(${name} ${PROJECT_SOURCE_DIR}/examples/${name}.cpp)
    target_include_directories(${name} PRIVATE ${ZUV_GENERATED_DIR}/include)
    target_link_libraries(${name} PRIVATE ${ZUV_PROGRAM_LIBRARY} zuv_flags)
    add_dependencies(${name} zuv_generated)
endforeach()
